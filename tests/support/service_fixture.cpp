// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_fixture.h"

#include <vector>

#include "sensor_doubles.h"
#include "sensor_modes.h"
#include "thread_count.h"
#include "vyrservice_test_peer.h"
#include "work_log.h"

namespace vyr_test {

using aidl::android::vyr::Event;
using android::vyr::binder::ServiceConfig;
using android::vyr::binder::VYRService;

void ServiceFixture::SetUp() {
    sensor_doubles::Reset();
    baseline_threads_ = SettledThreadCount();
    baseline_names_ = ThreadNames();
}

void ServiceFixture::TearDown() {
    DestroyService();
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_, std::chrono::seconds(5)))
        << "threads left: " << ThreadCount() << " (" << ThreadNames() << "), expected "
        << baseline_threads_ << " (" << baseline_names_ << ")";
}

ServiceConfig ServiceFixture::Config(std::map<std::string, bool> properties,
                                     const std::string& display_path) {
    ServiceConfig config;
    config.get_bool_property = [properties](const char* key, bool default_value) {
        auto it = properties.find(key);
        return it == properties.end() ? default_value : it->second;
    };
    config.startup_delay = std::chrono::milliseconds(0);
    config.display_state_path = display_path;
    return config;
}

size_t ServiceFixture::BlockOf(int32_t mode) {
    return mode == android::vyr::binder::kRangeMode ? 2 : 0;
}

void ServiceFixture::MakeService(bool als, bool range) {
    MakeService(Config({{kAlsProperty, als}, {kRangeProperty, range}}, display_path_));
    if (display_path_ != kNoDisplayPath) return;
    // Settle on the workers alone: the display monitor ends on the unopenable path.
    const size_t workers = (als ? 1 : 0) + (range ? 1 : 0);
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_ + workers, kWait));
}

void ServiceFixture::MakeService(const ServiceConfig& config) {
    DestroyService();
    service_ = ndk::SharedRefBase::make<VYRService>(config);
}

bool ServiceFixture::DestroyService() {
    service_.reset();
    return true;
}

int32_t ServiceFixture::Open(int32_t mode) {
    int32_t handle = 0;
    EXPECT_TRUE(service_->Open(mode, &handle).isOk());
    if (handle > 0) modes_[handle] = mode;
    return handle;
}

int32_t ServiceFixture::Enable(int32_t handle, int32_t period) {
    int32_t result = 1;
    EXPECT_TRUE(service_->Enable(handle, period, &result).isOk());
    if (result == 0) enabled_.insert(handle);
    return result;
}

void ServiceFixture::Disable(int32_t handle) {
    EXPECT_TRUE(service_->Disable(handle).isOk());
    enabled_.erase(handle);
}

int32_t ServiceFixture::Poll(int32_t handle, Event* event) {
    int32_t result = 1;
    EXPECT_TRUE(service_->PollOnce(handle, event, &result).isOk());
    return result;
}

int32_t ServiceFixture::OpenAndEnable(int32_t mode, int32_t period) {
    const int32_t handle = Open(mode);
    EXPECT_GT(handle, 0);
    const size_t before = WorkLogCount("EnableWork", handle);
    EXPECT_EQ(0, Enable(handle, period));
    EXPECT_TRUE(WaitForWorkLog("EnableWork", handle, before + 1));
    ServicePeer::SnapshotModeBlock(*service_, BlockOf(mode));
    return handle;
}

void ServiceFixture::DisableAndWait(int32_t handle) {
    const size_t before = WorkLogCount("DisableWork", handle);
    Disable(handle);
    EXPECT_TRUE(WaitForWorkLog("DisableWork", handle, before + 1));
    // The worker logs before its last library call; the snapshot waits for the whole item.
    ServicePeer::SnapshotModeBlock(*service_, BlockOf(modes_[handle]));
}

size_t ServiceFixture::WorkLogCount(const std::string& work, int32_t handle) {
    return CountWorkLogs(log_.Records(), work, handle);
}

bool ServiceFixture::WaitForWorkLog(const std::string& work, int32_t handle, size_t count) {
    return log_.WaitUntil(
        [&](const std::vector<LogRecord>& records) {
            return CountWorkLogs(records, work, handle) >= count;
        },
        kWait);
}

}  // namespace vyr_test
