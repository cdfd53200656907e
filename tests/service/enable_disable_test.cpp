// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>

#include "sensor_doubles.h"
#include "service_fixture.h"
#include "vyrservice_test_peer.h"
#include "work_log.h"

namespace vyr_test::service {
namespace {

using namespace std::chrono_literals;

using sensor_doubles::CallsNamed;
using sensor_doubles::CountOf;
using sensor_doubles::kAlsDisable;
using sensor_doubles::kAlsReadSingleShot;
using sensor_doubles::WaitForCalls;

using EnableDisableTest = ServiceFixture;

TEST_F(EnableDisableTest, EnableLogsAndQueuesForTheModesWorker) {
    MakeService();
    const int32_t als = Open(1);
    const int32_t range = Open(3);
    EXPECT_EQ(0, Enable(als, 250));
    EXPECT_EQ(0, Enable(range, 300));
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, "Enable handle " + std::to_string(als) + ", mode 1"));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO,
                              "Enable handle " + std::to_string(range) + ", mode 3"));
    EXPECT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO,
                             vyr_test::EnableWorkLine(1, 1, als, 250, 250, 0), kWait));
    EXPECT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO,
                             vyr_test::EnableWorkLine(3, 1, range, 300, 300, 1), kWait));

    DisableAndWait(als);
    DisableAndWait(range);
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO,
                              "DisableInternal handle " + std::to_string(als) + ", mode 1"));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::DisableWorkLine(1, 0, als, 250, 0)));
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::DisableWorkLine(3, 0, range, 300, 1)));
}

TEST_F(EnableDisableTest, PeriodBelowOneBecomesOneSecond) {
    MakeService();
    for (int32_t period : {0, -5}) {
        const int32_t handle = OpenAndEnable(1, period);
        EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO,
                                  vyr_test::EnableWorkLine(1, 1, handle, 1000, 1000, 0)));
        EXPECT_EQ(1000, ServicePeer::SnapshotModeBlock(*service_, 0).active_period);
        DisableAndWait(handle);
        ASSERT_TRUE(service_->Close(handle).isOk());
    }
}

TEST_F(EnableDisableTest, PeriodOfOneMillisecondSamplesAtOneMillisecond) {
    MakeService();
    const int32_t handle = OpenAndEnable(1, 1);
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::EnableWorkLine(1, 1, handle, 1, 1, 0)));
    // At a 1000 ms period three reads would take two seconds.
    const auto start = std::chrono::steady_clock::now();
    ASSERT_TRUE(WaitForCalls(kAlsReadSingleShot, 5, kWait));
    const auto reads = CallsNamed(kAlsReadSingleShot);
    DisableAndWait(handle);
    EXPECT_LT(reads[4].time - reads[2].time, 900ms);
    EXPECT_LT(std::chrono::steady_clock::now() - start, kWait);
}

TEST_F(EnableDisableTest, SecondEnableIsRefusedAndQueuesNothing) {
    MakeService();
    const int32_t handle = OpenAndEnable(3, 100);
    log_.Clear();
    EXPECT_EQ(-17, Enable(handle, 50));
    EXPECT_TRUE(log_.Records().empty());
    DisableAndWait(handle);
    // The refused enable would have been applied before the disable.
    EXPECT_EQ(0u, WorkLogCount("EnableWork", handle));
    EXPECT_EQ(1u, CountOf(sensor_doubles::kRangeInit));
}

TEST_F(EnableDisableTest, DisableOfDisabledClientLogsAndQueuesNothing) {
    MakeService();
    const int32_t handle = Open(3);
    EXPECT_TRUE(service_->Disable(handle).isOk());
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_DEBUG,
                             "DisableInternal already in disable state " + std::to_string(handle)));
    // Items are applied in order: a queued disable would show before this client's work.
    const int32_t other = OpenAndEnable(3, 100);
    DisableAndWait(other);
    EXPECT_EQ(0u, WorkLogCount("DisableWork", handle));
    EXPECT_EQ(1u, CountOf(sensor_doubles::kRangeUninit));
}

TEST_F(EnableDisableTest, DisableAfterEnableAndDisableAgain) {
    MakeService();
    const int32_t handle = OpenAndEnable(1, 100);
    DisableAndWait(handle);
    log_.Clear();
    EXPECT_TRUE(service_->Disable(handle).isOk());
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_DEBUG,
                             "DisableInternal already in disable state " + std::to_string(handle)));
    // Enabled again after a disable, with a new period.
    EXPECT_EQ(0, Enable(handle, 300));
    EXPECT_TRUE(WaitForWorkLog("EnableWork", handle));
    DisableAndWait(handle);
}

TEST_F(EnableDisableTest, UnknownHandles) {
    MakeService();
    EXPECT_EQ(-38, Enable(4242, 100));
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_ERROR, "Enable invalid handle 4242"));
    int32_t result = 0;
    EXPECT_TRUE(service_->EnableLowPower(4242, true, &result).isOk());
    EXPECT_EQ(-38, result);
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_ERROR, "EnableLowPower invalid handle 4242"));
    EXPECT_TRUE(service_->Disable(4242).isOk());
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_WARN, "DisableInternal invalid handle 4242"));
}

TEST_F(EnableDisableTest, LowPowerIsRefusedForRangeClients) {
    MakeService();
    const int32_t handle = Open(3);
    log_.Clear();
    int32_t result = 0;
    EXPECT_TRUE(service_->EnableLowPower(handle, true, &result).isOk());
    EXPECT_EQ(-22, result);
    EXPECT_TRUE(log_.Records().empty());
}

// The flag is the service's, not the client's: set by one client, it stays after that client
// closes and governs the next client alone.
TEST_F(EnableDisableTest, LowPowerIsServiceWide) {
    MakeService();
    const int32_t setter = Open(1);
    int32_t result = 1;
    ASSERT_TRUE(service_->EnableLowPower(setter, true, &result).isOk());
    EXPECT_EQ(0, result);
    ASSERT_TRUE(service_->Close(setter).isOk());

    const int32_t handle = OpenAndEnable(1, 200);
    EXPECT_TRUE(WaitForCalls(kAlsDisable, 2, kWait));
    DisableAndWait(handle);

    // Turned off again by any client of mode 1.
    ASSERT_TRUE(service_->EnableLowPower(handle, false, &result).isOk());
    EXPECT_EQ(0, result);
    const size_t disables = CountOf(kAlsDisable);
    const size_t reads = CountOf(kAlsReadSingleShot);
    ASSERT_EQ(0, Enable(handle, 200));
    ASSERT_TRUE(WaitForCalls(kAlsReadSingleShot, reads + 3, kWait));
    DisableAndWait(handle);
    EXPECT_EQ(disables, CountOf(kAlsDisable));
}

}  // namespace
}  // namespace vyr_test::service
