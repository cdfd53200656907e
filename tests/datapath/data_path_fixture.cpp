// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "data_path_fixture.h"

#include <chrono>
#include <thread>

#include "vyrservice_test_peer.h"

namespace vyr_test::datapath {

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

void DataPathTest::SetUp() {
    ServiceFixture::SetUp();
    MakeService();
}

void DataPathTest::TearDown() {
    // Let held sensor reads return, so that disabling can join the sampling threads.
    sensor_doubles::Reset();
    for (int32_t handle : enabled_) service_->Disable(handle);
    for (const auto& [handle, mode] : modes_) service_->Close(handle);
    WaitForIdleWorkers();
    ServiceFixture::TearDown();
}

std::shared_ptr<RecordingCallback> DataPathTest::NewCallback() {
    return ndk::SharedRefBase::make<RecordingCallback>();
}

std::shared_ptr<RecordingCallback> DataPathTest::SetCallbackOk(int32_t handle) {
    auto callback = NewCallback();
    int32_t result = 1;
    EXPECT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    EXPECT_EQ(result, 0);
    return callback;
}

const char* DataPathTest::ReadCallOf(int32_t mode) {
    return mode == kRange ? sensor_doubles::kRangeProcess : sensor_doubles::kAlsReadSingleShot;
}

void DataPathTest::StartHeldSampling(int32_t handle, int32_t mode, int32_t period_ms) {
    held_call_ = ReadCallOf(mode);
    sensor_doubles::Hold(held_call_);
    EXPECT_EQ(0, Enable(handle, period_ms));
    ASSERT_TRUE(sensor_doubles::WaitUntilHeld(held_call_, kWait));
    PublishNextSample();
}

void DataPathTest::PublishNextSample() {
    ASSERT_NE(held_call_, nullptr);
    size_t reads = sensor_doubles::CountOf(held_call_);
    // The blocked read returns and its sample is stored; the read after it is held again.
    sensor_doubles::ReleaseBlocked(held_call_);
    ASSERT_TRUE(sensor_doubles::WaitForCalls(held_call_, reads + 1, kWait));
}

void DataPathTest::WaitForIdleWorkers() {
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

}  // namespace vyr_test::datapath
