// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "in_process_service.h"

#include <thread>

namespace vyr_datapath {

using aidl::android::vyr::Event;
using android::vyr::binder::ServiceConfig;
using android::vyr::binder::VYRService;

namespace {

// The ambient-light and range blocks of the service's mode table.
constexpr size_t kModeBlocks[] = {0, 2};

}  // namespace

MultiRangingData RangeFrame(uint32_t time_ms) {
    MultiRangingData data{};
    data.time_ms = time_ms;
    data.zone_count = 1;
    data.valid = 1;
    return data;
}

void InProcessServiceTest::SetUp() {
    sensor_doubles::Reset();
    StartService(true);
}

void InProcessServiceTest::StartService(bool als_property) {
    if (service_ != nullptr) {
        WaitForIdleWorkers();
        service_.reset();
    }
    // No panel here: the display monitor stops at once and never enables the light sensor.
    service_ = ndk::SharedRefBase::make<VYRService>(
        Config({{vyr_test::kAlsProperty, als_property}, {vyr_test::kRangeProperty, true}}));
}

void InProcessServiceTest::TearDown() {
    // Let held sensor reads return, so that disabling can join the sampling threads.
    sensor_doubles::Reset();
    for (int32_t handle : enabled_) service_->Disable(handle);
    for (int32_t handle : opened_) service_->Close(handle);
    WaitForIdleWorkers();
    service_.reset();
}

std::shared_ptr<RecordingCallback> InProcessServiceTest::NewCallback() {
    return ndk::SharedRefBase::make<RecordingCallback>();
}

int32_t InProcessServiceTest::OpenOk(int32_t mode) {
    int32_t handle = 0;
    EXPECT_TRUE(service_->Open(mode, &handle).isOk());
    EXPECT_GT(handle, 0) << "Open(" << mode << ")";
    opened_.insert(handle);
    return handle;
}

void InProcessServiceTest::EnableOk(int32_t handle, int32_t period_ms) {
    int32_t result = -1;
    EXPECT_TRUE(service_->Enable(handle, period_ms, &result).isOk());
    EXPECT_EQ(result, 0) << "Enable(" << handle << ", " << period_ms << ")";
    enabled_.insert(handle);
}

void InProcessServiceTest::DisableNow(int32_t handle) {
    EXPECT_TRUE(service_->Disable(handle).isOk());
    enabled_.erase(handle);
}

int32_t InProcessServiceTest::Poll(int32_t handle, Event* event) {
    int32_t result = 1;
    EXPECT_TRUE(service_->PollOnce(handle, event, &result).isOk());
    return result;
}

const char* InProcessServiceTest::ReadCallOf(int32_t mode) {
    return mode == kRange ? sensor_doubles::kRangeProcess : sensor_doubles::kAlsReadSingleShot;
}

void InProcessServiceTest::StartHeldSampling(int32_t handle, int32_t mode, int32_t period_ms) {
    held_call_ = ReadCallOf(mode);
    sensor_doubles::Hold(held_call_);
    EnableOk(handle, period_ms);
    ASSERT_TRUE(sensor_doubles::WaitUntilHeld(held_call_, kWait));
    PublishNextSample();
}

void InProcessServiceTest::PublishNextSample() {
    ASSERT_NE(held_call_, nullptr);
    size_t reads = sensor_doubles::CountOf(held_call_);
    // The blocked read returns and its sample is stored; the read after it is held again.
    sensor_doubles::ReleaseBlocked(held_call_);
    ASSERT_TRUE(sensor_doubles::WaitForCalls(held_call_, reads + 1, kWait));
}

void InProcessServiceTest::WaitForIdleWorkers() {
    auto deadline = std::chrono::steady_clock::now() + kWait;
    for (size_t block : kModeBlocks) {
        while (true) {
            vyr_test::ModeBlockSnapshot snapshot =
                vyr_test::ServicePeer::SnapshotModeBlock(*service_, block);
            if (!snapshot.running && snapshot.enable_count <= 0) break;
            ASSERT_LT(std::chrono::steady_clock::now(), deadline)
                << "mode block " << block << " still sampling";
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
    }
}

}  // namespace vyr_datapath
