// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <aidl/android/vyr/BnEventCallback.h>
#include <android/log.h>

#include <condition_variable>
#include <mutex>
#include <vector>

#include "display_fixture.h"
#include "sensor_doubles.h"
#include "thread_count.h"

namespace vyr_test::display {
namespace {

using aidl::android::vyr::Event;
using sensor_doubles::Calls;
using sensor_doubles::CallsNamed;
using sensor_doubles::CountOf;
using sensor_doubles::kAlsCreate;
using sensor_doubles::kAlsDestroy;
using sensor_doubles::kRangeCreate;
using sensor_doubles::kRangeDestroy;
using sensor_doubles::kRangeEnable;
using sensor_doubles::kRangeInit;
using sensor_doubles::kRangeProcess;
using sensor_doubles::kRangeUninit;

using ShutdownTest = DisplayTest;

std::vector<std::string> CallNames() {
    std::vector<std::string> names;
    for (const auto& call : Calls()) names.push_back(call.name);
    return names;
}

bool Ready(const std::future<void>& future) {
    return future.wait_for(std::chrono::seconds(0)) == std::future_status::ready;
}

// A callback whose OnEvent does not return until the test lets it.
class BlockingCallback : public aidl::android::vyr::BnEventCallback {
  public:
    ndk::ScopedAStatus OnEvent(const Event& event) override {
        std::unique_lock<std::mutex> lock(mutex_);
        events_.push_back(event);
        changed_.notify_all();
        changed_.wait(lock, [this] { return released_; });
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus OnEventBatch(const std::vector<Event>&) override {
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus OnFlushComplete(int32_t) override { return ndk::ScopedAStatus::ok(); }
    bool WaitForEvent() {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kWait, [this] { return !events_.empty(); });
    }
    void Release() {
        std::lock_guard<std::mutex> lock(mutex_);
        released_ = true;
        changed_.notify_all();
    }
    std::vector<Event> Events() {
        std::lock_guard<std::mutex> lock(mutex_);
        return events_;
    }

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<Event> events_;
    bool released_ = false;
};

TEST_F(ShutdownTest, NeitherSensorCreatedStillDestroysBoth) {
    sensor_doubles::SetAlsCreateFails(true);
    sensor_doubles::SetRangeCreateFails(true);
    MakeService();
    // The monitor starts with the light property on, finds no sensor and ends.
    ASSERT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_ERROR,
                             "MonitorDisplayStatus: ALS sensor unavailable", kWait));
    ASSERT_TRUE(DestroyService());
    EXPECT_EQ((std::vector<std::string>{kAlsCreate, kRangeCreate, kAlsDestroy, kRangeDestroy}),
              CallNames());
}

TEST_F(ShutdownTest, NeitherPropertyOnStillDestroysBoth) {
    MakeService(false, false);
    ASSERT_TRUE(DestroyService());
    EXPECT_EQ((std::vector<std::string>{kAlsDestroy, kRangeDestroy}), CallNames());
}

TEST_F(ShutdownTest, WaitingMonitorEndsOnTheNextNotification) {
    MakeService();
    ASSERT_TRUE(WaitForMonitorWatching(true));
    std::future<void> destroyed = StartDestruction();
    ASSERT_TRUE(NotifyUntil([&] { return Ready(destroyed); }, kWait));
    EXPECT_FALSE(MonitorWatching());
    EXPECT_EQ((std::vector<std::string>{kAlsCreate, kRangeCreate, kAlsDestroy, kRangeDestroy}),
              CallNames());
    EXPECT_EQ(0u, EnableLines("Off\n"));
}

TEST_F(ShutdownTest, ItemsStillQueuedAreDiscarded) {
    MakeService();
    ASSERT_TRUE(WaitForMonitorWatching(true));
    // A failing Init() starts no processing thread, which destruction would not stop.
    sensor_doubles::SetResult(kRangeInit, 1);
    sensor_doubles::Hold(kRangeInit);
    int32_t first = 0;
    int32_t second = 0;
    int32_t result = 1;
    ASSERT_TRUE(service_->Open(3, &first).isOk());
    ASSERT_TRUE(service_->Enable(first, 100, &result).isOk());
    ASSERT_EQ(0, result);
    ASSERT_TRUE(sensor_doubles::WaitUntilHeld(kRangeInit, kWait));
    // Queued behind the held enable item.
    ASSERT_TRUE(service_->Disable(first).isOk());
    ASSERT_TRUE(service_->Open(3, &second).isOk());
    ASSERT_TRUE(service_->Enable(second, 50, &result).isOk());
    ASSERT_EQ(0, result);

    std::future<void> destroyed = StartDestruction();
    // The monitor has ended once its descriptor is gone, and the service's running flag with it.
    ASSERT_TRUE(NotifyUntil([] { return !MonitorWatching(); }, kWait));
    EXPECT_FALSE(Ready(destroyed)) << "destruction waits for the range worker";
    sensor_doubles::Release(kRangeInit);
    ASSERT_EQ(std::future_status::ready, destroyed.wait_for(kWait));

    // The held item was finished; the disable and the second enable were never applied.
    EXPECT_EQ(1u, CountOf(kRangeInit));
    ASSERT_EQ(1u, CountOf(kRangeEnable));
    EXPECT_EQ((std::vector<int64_t>{1}), CallsNamed(kRangeEnable).front().args);
    EXPECT_EQ(0u, CountOf(kRangeUninit));
    EXPECT_EQ(1u, WorkLogCount("EnableWork", first));
    EXPECT_EQ(0u, WorkLogCount("DisableWork", first));
    EXPECT_EQ(0u, WorkLogCount("EnableWork", second));
    const auto names = CallNames();
    ASSERT_GE(names.size(), 2u);
    EXPECT_EQ((std::vector<std::string>{kAlsDestroy, kRangeDestroy}),
              std::vector<std::string>(names.end() - 2, names.end()));
}

TEST_F(ShutdownTest, OpenClientsHaveTheirNotificationThreadsJoined) {
    MakeService(false, true);
    MultiRangingData sample{};
    sample.time_ms = 4242;
    sample.valid = 1;
    sensor_doubles::SetRangeData(sample);

    auto callback = ndk::SharedRefBase::make<BlockingCallback>();
    int32_t pushed = 0;
    int32_t result = 1;
    ASSERT_TRUE(service_->Open(3, &pushed).isOk());
    ASSERT_TRUE(service_->SetCallback(pushed, callback, &result).isOk());
    ASSERT_EQ(0, result);

    // Another client makes the range block store a sample, then stops its sampling again.
    int32_t sampler = 0;
    ASSERT_TRUE(service_->Open(3, &sampler).isOk());
    ASSERT_TRUE(service_->Enable(sampler, 10, &result).isOk());
    ASSERT_EQ(0, result);
    // The second Process() call begins after the first one's sample was stored.
    ASSERT_TRUE(sensor_doubles::WaitForCalls(kRangeProcess, 2, kWait));
    ASSERT_TRUE(service_->Disable(sampler).isOk());
    ASSERT_TRUE(WaitForWorkLog("DisableWork", sampler, 1));

    // Enabled with a failing Init(): a notification thread but no processing thread, so the
    // service can be destroyed with this client still enabled and open.
    sensor_doubles::SetResult(kRangeInit, 1);
    ASSERT_TRUE(service_->Enable(pushed, 10, &result).isOk());
    ASSERT_EQ(0, result);
    ASSERT_TRUE(callback->WaitForEvent());
    ASSERT_TRUE(WaitForWorkLog("EnableWork", pushed, 1));

    const size_t threads_with_client = ThreadCount();
    std::future<void> destroyed = StartDestruction();
    // The sensors are destroyed just before the members; the client table's release then waits
    // for the notification thread, which is inside OnEvent.
    ASSERT_TRUE(NotifyUntil([] { return CountOf(kRangeDestroy) == 1; }, kWait));
    EXPECT_EQ(std::future_status::timeout, destroyed.wait_for(300ms))
        << "destruction did not wait for the client's notification thread";
    callback->Release();
    ASSERT_EQ(std::future_status::ready, destroyed.wait_for(kWait));

    ASSERT_EQ(1u, callback->Events().size());
    EXPECT_EQ(4242, callback->Events().front().timestamp);
    EXPECT_TRUE(vyr_test::WaitForThreadCountBelow(threads_with_client, kWait))
        << vyr_test::ThreadNames();
}

}  // namespace
}  // namespace vyr_test::display
