// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Calls that a client makes from inside its own OnEvent: they run on the client's notification
// thread, which must neither join itself nor outlive the entry it reads.

#include <aidl/android/vyr/Event.h>
#include <android/log.h>
#include <signal.h>

#include <chrono>
#include <future>
#include <string>
#include <thread>

#include "child_process.h"
#include "data_path_fixture.h"
#include "temp_dir.h"
#include "thread_count.h"
#include "vyrservice_test_peer.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;

constexpr size_t kRangeBlock = 2;

class NestedCallTest : public DataPathTest {
  protected:
    void SetUp() override {
        DataPathTest::SetUp();
        // Without the light sensor there is no display monitor whose end could race the count.
        MakeService(false);
        sensor_doubles::SetRangeData(RangeFrame(7));
        idle_threads_ = vyr_test::ThreadCount();
        handle_ = Open(kRange);
        EXPECT_GT(handle_, 0);
        callback_ = NewCallback();
        int32_t result = 1;
        ASSERT_TRUE(service_->SetCallback(handle_, callback_, &result).isOk());
        ASSERT_EQ(result, 0);
    }

    bool Logged(int priority, const std::string& message) {
        return log_.WaitFor(kTag, priority, message, kWait);
    }
    std::string HandleAndMode() { return "handle " + std::to_string(handle_) + ", mode 3"; }
    // Back to the range worker alone: the notification and processing threads are gone.
    bool NotificationThreadEnded() { return vyr_test::WaitForThreadCount(idle_threads_, kWait); }

    size_t idle_threads_ = 0;
    int32_t handle_ = 0;
    std::shared_ptr<RecordingCallback> callback_;
};

TEST_F(NestedCallTest, DisableFromOnEventDisablesAndEndsTheThread) {
    callback_->SetReaction([this](size_t count) {
        if (count == 1) service_->Disable(handle_);
    });
    EXPECT_EQ(0, Enable(handle_, 1));
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    EXPECT_TRUE(Logged(ANDROID_LOG_INFO, "DisableInternal " + HandleAndMode()));
    WaitForIdleWorkers();
    EXPECT_TRUE(NotificationThreadEnded());
    EXPECT_EQ(callback_->Count(), 1u) << "nothing is delivered after the disable";

    // The client is disabled, not gone: it can be enabled again and receives events.
    callback_->SetReaction(nullptr);
    EXPECT_EQ(0, Enable(handle_, 1));
    EXPECT_TRUE(callback_->WaitForEvents(2, kWait));
}

TEST_F(NestedCallTest, DisableAndCloseFromOnEventRemoveTheClient) {
    callback_->SetReaction([this](size_t count) {
        if (count != 1) return;
        service_->Disable(handle_);
        service_->Close(handle_);
    });
    EXPECT_EQ(0, Enable(handle_, 1));
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    EXPECT_TRUE(Logged(ANDROID_LOG_INFO, "DisableInternal " + HandleAndMode()));
    WaitForIdleWorkers();
    EXPECT_TRUE(NotificationThreadEnded());
    Event event{};
    EXPECT_EQ(Poll(handle_, &event), -22) << "the handle is closed";
    // The table slot is free again: ten more clients fit.
    for (int i = 0; i < 10; ++i) EXPECT_GT(Open(kRange), 0);
}

TEST_F(NestedCallTest, CloseFromOnEventKeepsTheEnableCountAsCloseAlwaysDoes) {
    callback_->SetReaction([this](size_t count) {
        if (count == 1) service_->Close(handle_);
    });
    EXPECT_EQ(0, Enable(handle_, 1));
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    EXPECT_TRUE(vyr_test::WaitForThreadCount(idle_threads_ + 1, kWait))
        << "the notification thread ends; sampling goes on for the enable left in force";
    Event event{};
    EXPECT_EQ(Poll(handle_, &event), -22);
    EXPECT_EQ(vyr_test::ServicePeer::SnapshotModeBlock(*service_, kRangeBlock).enable_count, 1);
    // What Close leaves behind is withdrawn as a disable item would; the fixture expects idle
    // workers at its end.
    vyr_test::ServicePeer::PushWorkItem(*service_, {false, kRange, handle_, 0});
}

TEST_F(NestedCallTest, EnableAfterANestedDisableStartsOneNewThread) {
    // The new thread may deliver before the nested Enable has returned to the old one.
    std::promise<int32_t> enable_result;
    std::future<int32_t> nested_result = enable_result.get_future();
    callback_->SetReaction([this, &enable_result](size_t count) {
        if (count != 1) return;
        service_->Disable(handle_);
        int32_t result = 1;
        service_->Enable(handle_, 1, &result);
        enable_result.set_value(result);
    });
    EXPECT_EQ(0, Enable(handle_, 1));
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    sensor_doubles::SetRangeData(RangeFrame(9));
    ASSERT_TRUE(callback_->WaitForEvents(2, kWait)) << "the new notification thread delivers";
    ASSERT_EQ(nested_result.wait_for(kWait), std::future_status::ready);
    EXPECT_EQ(nested_result.get(), 0);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, "Enable " + HandleAndMode()), 2u);
    // The old thread has ended; one notification thread and the range worker remain.
    EXPECT_TRUE(vyr_test::WaitForThreadCount(idle_threads_ + 2, kWait))
        << "the processing thread and one notification thread";
    Disable(handle_);
    EXPECT_TRUE(NotificationThreadEnded());
}

// A client released for its death while its OnEvent waits for the API lock (a nested call made
// after the release took the lock): the release must not wait for that thread with the lock held.
class DeathDuringNestedCallTest : public NestedCallTest {
  protected:
    // Enables the client, runs `prepare`, and at the client's first event has `cause_death` start
    // its death, waits inside OnEvent until the service is releasing the client, then polls from
    // OnEvent. Returns that poll's result.
    int32_t PollFromOnEventDuringTheRelease(const std::function<void()>& prepare,
                                            const std::function<void()>& cause_death) {
        std::promise<void> ready;
        std::shared_future<void> ready_future = ready.get_future().share();
        std::promise<int32_t> nested;
        std::future<int32_t> nested_result = nested.get_future();
        callback_->SetReaction([&](size_t count) {
            if (count != 1) return;
            ready_future.wait();
            cause_death();
            // Logged with the API lock held, before the client's thread is stopped.
            Logged(ANDROID_LOG_INFO, DiedLine());
            Event event{};
            int32_t result = 1;
            service_->PollOnce(handle_, &event, &result);
            nested.set_value(result);
        });
        EXPECT_EQ(0, Enable(handle_, 1));
        prepare();
        ready.set_value();
        if (nested_result.wait_for(2 * kWait) != std::future_status::ready) {
            ADD_FAILURE() << "the nested call never returned";
            return 1;
        }
        return nested_result.get();
    }
    std::string DiedLine() {
        return "client " + std::to_string(handle_) +
               " mode 3 died; disable sensor and remove client handle";
    }
};

TEST_F(DeathDuringNestedCallTest, ProcessEndReleasesWithoutWaitingForTheClientsThread) {
    TempDir dir;
    vyr_test::ChildProcess client({"/bin/sleep", "60"}, {}, dir.Path("stderr"));
    ASSERT_TRUE(client.started());
    const int32_t result = PollFromOnEventDuringTheRelease(
        [this, &client] {
            // After the test's own calls, which mark the handle as used by this process.
            vyr_test::ServicePeer::SetOnlyClientProcess(*service_, handle_, client.pid());
        },
        [&client] {
            client.Signal(SIGKILL);
            client.Wait(kWait);
        });
    EXPECT_EQ(result, -22) << "the nested call ran after the release";
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, DiedLine()), 1u);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, "Receive binder death callback"), 1u);
    WaitForIdleWorkers();
    EXPECT_TRUE(vyr_test::WaitForThreadCount(idle_threads_ + 1, kWait))
        << "the notification thread ends; the process watcher's thread stays";
}

TEST_F(DeathDuringNestedCallTest, DeathNoticeReleasesWithoutWaitingForTheClientsThread) {
    std::thread notice;
    const int32_t result = PollFromOnEventDuringTheRelease(
        [] {},
        [this, &notice] {
            notice = std::thread([this] {
                vyr_test::ServicePeer::DeliverBinderDeath(*service_, callback_->asBinder().get());
            });
        });
    notice.join();
    EXPECT_EQ(result, -22) << "the nested call ran after the release";
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, DiedLine()), 1u);
    WaitForIdleWorkers();
    EXPECT_TRUE(NotificationThreadEnded());
}

}  // namespace
}  // namespace vyr_test::datapath
