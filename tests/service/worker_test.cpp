// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>

#include "sensor_doubles.h"
#include "service_fixture.h"
#include "thread_count.h"
#include "vyrservice_test_peer.h"
#include "work_log.h"

namespace vyr_test::service {
namespace {

using android::vyr::binder::WorkItem;
using sensor_doubles::Call;
using sensor_doubles::Calls;
using sensor_doubles::CallsNamed;
using sensor_doubles::CountOf;
using sensor_doubles::kAlsReadSingleShot;
using sensor_doubles::kAlsSetTorchLightState;
using sensor_doubles::kRangeEnable;
using sensor_doubles::kRangeInit;
using sensor_doubles::kRangeProcess;
using sensor_doubles::kRangeUninit;
using sensor_doubles::WaitForCalls;

using WorkerTest = ServiceFixture;

// Range-library calls other than Process, in order, as "Name(args)".
std::vector<std::string> RangeSwitching() {
    std::vector<std::string> out;
    for (const Call& call : Calls()) {
        if (call.name != kRangeInit && call.name != kRangeEnable && call.name != kRangeUninit) {
            continue;
        }
        std::string text = call.name + "(";
        for (size_t i = 0; i < call.args.size(); ++i) {
            text += (i ? "," : "") + std::to_string(call.args[i]);
        }
        out.push_back(text + ")");
    }
    return out;
}

TEST_F(WorkerTest, ActivePeriodIsTheSmallestAndRecomputedOnDisable) {
    MakeService();
    const int32_t first = OpenAndEnable(3, 200);
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::EnableWorkLine(3, 1, first, 200, 200, 1)));
    const int32_t second = OpenAndEnable(3, 100);
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::EnableWorkLine(3, 2, second, 100, 100, 1)));
    DisableAndWait(second);
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::DisableWorkLine(3, 1, second, 200, 1)));
    EXPECT_EQ(200, ServicePeer::SnapshotModeBlock(*service_, 2).active_period);
    DisableAndWait(first);
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::DisableWorkLine(3, 0, first, 200, 1)));
}

TEST_F(WorkerTest, RecomputedActivePeriodIsCappedAtFiveSeconds) {
    MakeService();
    const int32_t first = OpenAndEnable(1, 8000);
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO,
                              vyr_test::EnableWorkLine(1, 1, first, 8000, 8000, 0)));
    const int32_t second = OpenAndEnable(1, 9000);
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO,
                              vyr_test::EnableWorkLine(1, 2, second, 9000, 8000, 0)));
    DisableAndWait(first);
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::DisableWorkLine(1, 1, first, 5000, 0)));
    const auto block = ServicePeer::SnapshotModeBlock(*service_, 0);
    EXPECT_EQ(5000, block.active_period);
    EXPECT_TRUE(block.running);
    DisableAndWait(second);
    // The last period stays after sampling stops.
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::DisableWorkLine(1, 0, second, 5000, 0)));
    EXPECT_FALSE(ServicePeer::SnapshotModeBlock(*service_, 0).running);
}

TEST_F(WorkerTest, DisableWithoutEnableMakesTheCountNegative) {
    MakeService();
    ServicePeer::PushWorkItem(*service_, WorkItem{false, 3, 77, 0});
    ASSERT_TRUE(WaitForWorkLog("DisableWork", 77));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_WARN,
                              "DisableWork: mode 3 enable count becomes negative (-1)"));
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::DisableWorkLine(3, -1, 77, 1000, 1)));
    const auto block = ServicePeer::SnapshotModeBlock(*service_, 2);
    EXPECT_EQ(-1, block.enable_count);
    EXPECT_FALSE(block.running);
    EXPECT_EQ((std::vector<std::string>{"RangeSensor::Enable(0)", "RangeSensor::Uninit()"}),
              RangeSwitching());

    // The count is not clamped: one enable brings it back to 0, and sampling starts regardless.
    const int32_t handle = OpenAndEnable(3, 100);
    EXPECT_TRUE(
        log_.Contains(kTag, ANDROID_LOG_INFO, vyr_test::EnableWorkLine(3, 0, handle, 100, 100, 1)));
    EXPECT_TRUE(WaitForCalls(kRangeProcess, 1, kWait));
    DisableAndWait(handle);
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_WARN,
                              "DisableWork: mode 3 enable count becomes negative (-1)"));
}

TEST_F(WorkerTest, EveryRangeEnableInitsAndEveryDisableUninits) {
    MakeService();
    const int32_t first = OpenAndEnable(3, 100);
    const int32_t second = OpenAndEnable(3, 100);
    DisableAndWait(first);
    DisableAndWait(second);
    EXPECT_EQ((std::vector<std::string>{"RangeSensor::Init()", "RangeSensor::Enable(1)",
                                        "RangeSensor::Init()", "RangeSensor::Enable(1)",
                                        "RangeSensor::Uninit()", "RangeSensor::Enable(0)",
                                        "RangeSensor::Uninit()"}),
              RangeSwitching());
    for (const Call& call : CallsNamed(kRangeProcess)) {
        EXPECT_EQ((std::vector<int64_t>{3}), call.args);
    }
}

TEST_F(WorkerTest, FailedInitStartsNoProcessingThread) {
    sensor_doubles::SetResult(kRangeInit, -5);
    MakeService();
    const size_t threads = ThreadCount();
    const int32_t handle = OpenAndEnable(3, 50);
    // The snapshot waits for the worker to finish the item.
    EXPECT_TRUE(ServicePeer::SnapshotModeBlock(*service_, 2).running);
    EXPECT_EQ(threads, ThreadCount());
    EXPECT_EQ(1u, CountOf(kRangeEnable));
    DisableAndWait(handle);
    EXPECT_EQ(0u, CountOf(kRangeProcess));
    EXPECT_FALSE(ServicePeer::SnapshotModeBlock(*service_, 2).running);
}

TEST_F(WorkerTest, AmbientLightFlagFollowsTheFirstEnableAndTheLastDisable) {
    MakeService();
    const int32_t first = OpenAndEnable(1, 100);
    ASSERT_TRUE(WaitForCalls(kAlsReadSingleShot, 1, kWait));
    for (const Call& call : CallsNamed(kAlsReadSingleShot)) {
        EXPECT_TRUE(call.als_enabled);
        EXPECT_EQ((std::vector<int64_t>{1, 30}), call.args);
    }
    const int32_t second = OpenAndEnable(1, 100);
    DisableAndWait(first);
    ASSERT_TRUE(service_->SetTorchLightState(0).isOk());
    EXPECT_TRUE(CallsNamed(kAlsSetTorchLightState).back().als_enabled);
    DisableAndWait(second);
    ASSERT_TRUE(service_->SetTorchLightState(0).isOk());
    EXPECT_FALSE(CallsNamed(kAlsSetTorchLightState).back().als_enabled);
}

TEST_F(WorkerTest, WorkersRunIndependently) {
    sensor_doubles::Hold(kRangeInit);
    MakeService();
    const int32_t range = Open(3);
    ASSERT_EQ(0, Enable(range, 100));
    ASSERT_TRUE(sensor_doubles::WaitUntilHeld(kRangeInit, kWait));
    // The range worker is stuck in Init; the spectral one still applies its items.
    const int32_t als = OpenAndEnable(1, 100);
    DisableAndWait(als);
    EXPECT_EQ(0u, CountOf(kRangeEnable));
    sensor_doubles::Release(kRangeInit);
    DisableAndWait(range);
}

TEST_F(WorkerTest, ItemsOfOneWorkerAreAppliedInQueueOrder) {
    sensor_doubles::Hold(kRangeInit);
    MakeService();
    const int32_t a = Open(3);
    const int32_t b = Open(3);
    ASSERT_EQ(0, Enable(a, 300));
    ASSERT_TRUE(sensor_doubles::WaitUntilHeld(kRangeInit, kWait));
    ASSERT_EQ(0, Enable(b, 200));
    ASSERT_TRUE(service_->Disable(a).isOk());
    ASSERT_TRUE(service_->Disable(b).isOk());
    sensor_doubles::Release(kRangeInit);
    ASSERT_TRUE(WaitForWorkLog("DisableWork", b));
    std::vector<std::string> work;
    for (const auto& record : log_.Records()) {
        if (record.message.rfind("EnableWork", 0) == 0 ||
            record.message.rfind("DisableWork", 0) == 0) {
            work.push_back(record.message);
        }
    }
    EXPECT_EQ((std::vector<std::string>{vyr_test::EnableWorkLine(3, 1, a, 300, 300, 1),
                                        vyr_test::EnableWorkLine(3, 2, b, 200, 200, 1),
                                        vyr_test::DisableWorkLine(3, 1, a, 200, 1),
                                        vyr_test::DisableWorkLine(3, 0, b, 200, 1)}),
              work);
}

}  // namespace
}  // namespace vyr_test::service
