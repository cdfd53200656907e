// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service on the sensor doubles in a process of its own, reached through the binder NDK
// alone: open, enable, poll, callbacks, calls nested in OnEvent, the death of a client, and the
// client library's re-attach across a restart of the service. The same suite runs against a
// device's libbinder_ndk (the module vyr_service_ndk_tests).

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>
#include <vyr/sensor_client.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <filesystem>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "child_process.h"
#include "recording_callback.h"
#include "test_files.h"

namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;
using vyr_test::ChildProcess;
using vyr_test::RecordingCallback;

constexpr int32_t kRange = 3;
constexpr milliseconds kWait{10000};

template <typename Predicate>
bool Eventually(Predicate predicate) {
    const auto deadline = std::chrono::steady_clock::now() + kWait;
    while (!predicate()) {
        if (std::chrono::steady_clock::now() > deadline) return false;
        std::this_thread::sleep_for(milliseconds(5));
    }
    return true;
}

std::string DoublesService() {
#if defined(VYR_DOUBLES_SERVICE)
    return VYR_DOUBLES_SERVICE;
#else
    return vyr_test::ProgramBesideThisOne("vyr_doubles_service");
#endif
}

// What the client library told the application.
class Listener : public vyr::SensorClientListener {
  public:
    void OnEvent(const Event& /*event*/) override { Add(&events_); }
    void OnResumed(int32_t /*old_handle*/, int32_t /*new_handle*/, milliseconds /*since*/) override {
        Add(&resumed_);
    }
    bool WaitForEvents(int count) { return WaitFor(&events_, count); }
    bool WaitForResumed(int count) { return WaitFor(&resumed_, count); }
    int events() {
        std::lock_guard<std::mutex> lock(mutex_);
        return events_;
    }

  private:
    void Add(int* counter) {
        {
            std::lock_guard<std::mutex> lock(mutex_);
            ++*counter;
        }
        changed_.notify_all();
    }
    bool WaitFor(int* counter, int count) {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kWait, [&] { return *counter >= count; });
    }
    std::mutex mutex_;
    std::condition_variable changed_;
    int events_ = 0;
    int resumed_ = 0;
};

class ServiceAcrossProcessesTest : public ::testing::Test {
  protected:
    void SetUp() override {
        dir_ = vyr_test::MakeTempDir("vyr-doubles-");
        ASSERT_FALSE(dir_.empty());
        // The host runtime's registry; a device's servicemanager has no use for it.
        setenv("VYR_BINDER_DIR", dir_.c_str(), 1);
        ABinderProcess_startThreadPool();
        name_ = "vyr.doubles." + std::to_string(getpid()) + "." + std::to_string(++tests_);
        StartService();
    }

    void TearDown() override {
        service_.reset();
        server_.reset();
        std::error_code ignored;
        std::filesystem::remove_all(dir_, ignored);
    }

    void StartService() {
        server_ = std::make_unique<ChildProcess>(
            std::vector<std::string>{DoublesService(), "serve", name_},
            std::map<std::string, std::string>{}, dir_ + "/service.log");
        ASSERT_TRUE(server_->ReadLineStartingWith("registered", kWait)) << "no service";
        service_ =
            IVYRService::fromBinder(ndk::SpAIBinder(AServiceManager_checkService(name_.c_str())));
        ASSERT_NE(service_, nullptr);
    }

    void KillService() {
        server_->Signal(SIGKILL);
        ASSERT_TRUE(server_->Wait(kWait));
    }

    int32_t OpenRange() {
        int32_t handle = 0;
        EXPECT_TRUE(service_->Open(kRange, &handle).isOk());
        EXPECT_GT(handle, 0);
        return handle;
    }

    void EnableAt(int32_t handle, int32_t period_ms) {
        int32_t result = -1;
        ASSERT_TRUE(service_->Enable(handle, period_ms, &result).isOk());
        ASSERT_EQ(result, 0);
    }

    // PollOnce's result code.
    int32_t Poll(int32_t handle) {
        Event event;
        int32_t result = 1;
        EXPECT_TRUE(service_->PollOnce(handle, &event, &result).isOk());
        return result;
    }

    static inline int tests_ = 0;
    std::string dir_;
    std::string name_;
    std::unique_ptr<ChildProcess> server_;
    std::shared_ptr<IVYRService> service_;
};

TEST_F(ServiceAcrossProcessesTest, OpenEnablePollDisableClose) {
    const int32_t handle = OpenRange();
    EnableAt(handle, 20);
    EXPECT_TRUE(Eventually([&] { return Poll(handle) == 0; })) << "no sample polled";
    ASSERT_TRUE(service_->Disable(handle).isOk());
    ASSERT_TRUE(service_->Close(handle).isOk());
    EXPECT_EQ(Poll(handle), -EINVAL);
}

TEST_F(ServiceAcrossProcessesTest, ACallbackGetsTheSamplesPushed) {
    const int32_t handle = OpenRange();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = -1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_EQ(result, 0);
    EnableAt(handle, 20);
    EXPECT_TRUE(callback->WaitForEvents(3, kWait));
    ASSERT_TRUE(service_->Disable(handle).isOk());
    ASSERT_TRUE(service_->Close(handle).isOk());
}

// A client that calls the service from its OnEvent (the notification thread waits for the reply
// meanwhile) is served, and its events go on.
TEST_F(ServiceAcrossProcessesTest, CallsFromOnEventAreServed) {
    const int32_t handle = OpenRange();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    std::atomic<int> nested_ok{0};
    std::shared_ptr<IVYRService> service = service_;
    callback->SetReaction([service, handle, &nested_ok](size_t /*count*/) {
        Event event;
        int32_t result = 0;
        if (service->PollOnce(handle, &event, &result).isOk()) ++nested_ok;
    });
    int32_t result = -1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    EnableAt(handle, 20);
    EXPECT_TRUE(callback->WaitForEvents(5, kWait));
    ASSERT_TRUE(service_->Disable(handle).isOk());
    ASSERT_TRUE(service_->Close(handle).isOk());
    callback->SetReaction(nullptr);
    EXPECT_GE(nested_ok.load(), 4);
}

// The service releases the handle of a client whose process dies.
TEST_F(ServiceAcrossProcessesTest, TheDeathOfAClientReleasesItsHandle) {
    ChildProcess client({DoublesService(), "client", name_}, {}, dir_ + "/client.log");
    std::optional<std::string> line = client.ReadLineStartingWith("handle ", kWait);
    ASSERT_TRUE(line) << "the client never enabled";
    const int32_t handle = atoi(line->c_str() + 7);
    ASSERT_GT(handle, 0);
    EXPECT_NE(Poll(handle), -EINVAL);
    client.Signal(SIGKILL);
    ASSERT_TRUE(client.Wait(kWait));
    EXPECT_TRUE(Eventually([&] { return Poll(handle) == -EINVAL; })) << "the handle outlived it";
}

// The client library re-attaches to the next instance of the service and its events resume.
TEST_F(ServiceAcrossProcessesTest, TheClientLibraryReattachesAcrossARestart) {
    vyr::SensorSettings settings;
    settings.mode = kRange;
    settings.period_ms = 20;
    settings.use_callback = true;
    vyr::ReattachPolicy policy;
    policy.service_name = name_;
    Listener listener;
    vyr::SensorClient client(settings, &listener, policy);
    ASSERT_EQ(client.Start(service_), 0);
    ASSERT_TRUE(listener.WaitForEvents(3));
    service_.reset();
    KillService();
    StartService();
    ASSERT_TRUE(listener.WaitForResumed(1)) << "never re-attached";
    const int before = listener.events();
    EXPECT_TRUE(listener.WaitForEvents(before + 3)) << "no events from the new instance";
    client.Stop();
    EXPECT_EQ(client.state(), vyr::SensorClient::State::kStopped);
}

}  // namespace
