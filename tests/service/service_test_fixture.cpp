// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_test_fixture.h"

#include <thread>

namespace vyr_service_test {

void ServiceTest::SetUp() {
    sensor_doubles::Reset();
    baseline_threads_ = vyr_test::SettledThreadCount();
}

void ServiceTest::TearDown() {
    DestroyService();
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_, 5s))
        << "threads left: " << ThreadCount() << ", expected " << baseline_threads_;
}

void ServiceTest::MakeService(bool als, bool range) {
    MakeService(Config({{kAlsProperty, als}, {kRangeProperty, range}}));
    // Settle on the workers alone: the display monitor ends on the unopenable path.
    const size_t workers = (als ? 1 : 0) + (range ? 1 : 0);
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_ + workers, kWait));
}

void ServiceTest::MakeService(const ServiceConfig& config) {
    impl_ = ndk::SharedRefBase::make<VYRService>(config);
    service_ = impl_;
}

void ServiceTest::DestroyService() {
    service_.reset();
    impl_.reset();
}

int32_t ServiceTest::Open(int32_t mode) {
    int32_t handle = 0;
    EXPECT_TRUE(service_->Open(mode, &handle).isOk());
    modes_[handle] = mode;
    return handle;
}

int32_t ServiceTest::Enable(int32_t handle, int32_t period) {
    int32_t result = 1;
    EXPECT_TRUE(service_->Enable(handle, period, &result).isOk());
    return result;
}

int32_t ServiceTest::OpenAndEnable(int32_t mode, int32_t period) {
    const int32_t handle = Open(mode);
    EXPECT_GT(handle, 0);
    const size_t before = WorkLogCount("EnableWork", handle);
    EXPECT_EQ(0, Enable(handle, period));
    EXPECT_TRUE(WaitForWorkLog("EnableWork", handle, before + 1));
    vyr_test::ServicePeer::SnapshotModeBlock(*impl_, BlockOf(mode));
    return handle;
}

void ServiceTest::DisableAndWait(int32_t handle) {
    const size_t before = WorkLogCount("DisableWork", handle);
    EXPECT_TRUE(service_->Disable(handle).isOk());
    EXPECT_TRUE(WaitForWorkLog("DisableWork", handle, before + 1));
    // The worker logs before its last library call; the snapshot waits for the whole item.
    vyr_test::ServicePeer::SnapshotModeBlock(*impl_, BlockOf(modes_[handle]));
}

}  // namespace vyr_service_test
