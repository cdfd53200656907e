// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// SetCallback and the notification loop that pushes each new sample to a client's callback.

#include <aidl/android/vyr/Event.h>
#include <android/log.h>

#include <chrono>
#include <thread>
#include <vector>

#include "data_path_fixture.h"
#include "recording_callback.h"
#include "vyrservice_test_peer.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;
using android::vyr::binder::VYRService;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr size_t kRangeBlock = 2;

MultiRangingData Frame(uint32_t time_ms) {
    MultiRangingData data{};
    data.time_ms = time_ms;
    data.zone_count = 1;
    data.zones[0].distance_mm = 500;
    data.valid = 1;
    return data;
}

using CallbackTest = DataPathTest;

TEST_F(CallbackTest, CallbackOfAnEnabledClientCannotBeReplaced) {
    sensor_doubles::SetRangeData(Frame(1));
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    auto first = SetCallbackOk(handle);
    StartHeldSampling(handle, kRange);
    ASSERT_TRUE(first->WaitForEvents(1, kWait));

    auto second = NewCallback();
    int32_t result = 0;
    EXPECT_TRUE(service_->SetCallback(handle, second, &result).isOk());
    EXPECT_EQ(result, -1);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_ERROR,
                         "SetCallback failed. callback can only be set at DISABLE state"),
              1u);

    // The next sample still goes to the first callback.
    sensor_doubles::SetRangeData(Frame(2));
    PublishNextSample();
    ASSERT_TRUE(first->WaitForEvents(2, kWait));
    EXPECT_EQ(first->Events()[1].timestamp, 2);
    EXPECT_EQ(second->Count(), 0u);

    // Once disabled, the callback may be replaced and the new one is used at the next enable.
    Disable(handle);
    EXPECT_TRUE(service_->SetCallback(handle, second, &result).isOk());
    EXPECT_EQ(result, 0);
    sensor_doubles::Reset();
    WaitForIdleWorkers();
    sensor_doubles::SetRangeData(Frame(3));
    size_t first_count = first->Count();
    EXPECT_EQ(0, Enable(handle, 1));
    ASSERT_TRUE(second->WaitForEvents(1, kWait));
    EXPECT_EQ(second->Events()[0].timestamp, 3);
    EXPECT_EQ(first->Count(), first_count);
}

TEST_F(CallbackTest, EachSampleIsPushedOnce) {
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    auto callback = SetCallbackOk(handle);
    sensor_doubles::SetRangeData(Frame(1));
    StartHeldSampling(handle, kRange);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));
    for (uint32_t t = 2; t <= 3; ++t) {
        sensor_doubles::SetRangeData(Frame(t));
        PublishNextSample();
        ASSERT_TRUE(callback->WaitForEvents(t, kWait));
    }
    std::vector<Event> events = callback->Events();
    ASSERT_EQ(events.size(), 3u);
    for (size_t i = 0; i < events.size(); ++i) {
        EXPECT_EQ(events[i].timestamp, static_cast<int64_t>(i + 1));
        EXPECT_EQ(events[i].data.size(), 21u);
        EXPECT_EQ(events[i].data[11], 500.0f);
    }
}

TEST_F(CallbackTest, ClientWithoutCallbackGetsNoNotificationThread) {
    sensor_doubles::SetRangeData(Frame(1));
    int32_t pusher = Open(kRange);
    int32_t poller = Open(kRange);
    for (int32_t handle : {pusher, poller}) EXPECT_GT(handle, 0);
    auto callback = SetCallbackOk(pusher);
    EXPECT_EQ(0, Enable(poller, 1));
    StartHeldSampling(pusher, kRange);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));

    // No thread of the poller's took the sample on its behalf.
    Event event{};
    EXPECT_EQ(Poll(poller, &event), 0);
    EXPECT_EQ(event.timestamp, 1);
}

TEST_F(CallbackTest, FailingCallbackKeepsReceivingNewSamples) {
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    auto callback = SetCallbackOk(handle);
    callback->SetFailing(true);
    sensor_doubles::SetRangeData(Frame(1));
    StartHeldSampling(handle, kRange);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));

    sensor_doubles::SetRangeData(Frame(2));
    PublishNextSample();
    ASSERT_TRUE(callback->WaitForEvents(2, kWait));
    EXPECT_EQ(callback->Events()[1].timestamp, 2);
}

TEST_F(CallbackTest, DisableDuringTheSleepEndsTheLoopAtOnce) {
    // Every sample is invalid, so the loop's first poll logs and the loop sleeps a whole period.
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    auto callback = SetCallbackOk(handle);
    constexpr int32_t kLongPeriodMs = 8000;
    EXPECT_EQ(0, Enable(handle, kLongPeriodMs));
    ASSERT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_WARN, "PollInternal, invalid data", kWait));

    auto start = steady_clock::now();
    Disable(handle);
    auto took = steady_clock::now() - start;
    EXPECT_LT(took, milliseconds(kLongPeriodMs / 2))
        << "Disable waited for the notification loop's period";
    WaitForIdleWorkers();
    EXPECT_EQ(callback->Count(), 0u);
}

TEST_F(CallbackTest, PeriodBelowOneBecomesOneSecond) {
    int32_t zero = Open(kRange);
    int32_t negative = Open(kRange);
    for (int32_t handle : {zero, negative}) EXPECT_GT(handle, 0);
    SetCallbackOk(zero);
    EXPECT_EQ(0, Enable(zero, 0));
    EXPECT_EQ(0, Enable(negative, -5));
    auto deadline = steady_clock::now() + kWait;
    vyr_test::ModeBlockSnapshot snapshot{};
    do {
        snapshot = vyr_test::ServicePeer::SnapshotModeBlock(*service_, kRangeBlock);
        if (snapshot.enable_count < 2) std::this_thread::sleep_for(milliseconds(5));
    } while (snapshot.enable_count < 2 && steady_clock::now() < deadline);
    ASSERT_EQ(snapshot.enable_count, 2);
    EXPECT_EQ(snapshot.periods.at(zero), 1000);
    EXPECT_EQ(snapshot.periods.at(negative), 1000);
    EXPECT_EQ(snapshot.active_period, 1000);
}

}  // namespace
}  // namespace vyr_test::datapath
