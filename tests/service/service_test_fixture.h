// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/IVYRService.h>
#include <android/log.h>
#include <gtest/gtest.h>

#include <chrono>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "log_capture.h"
#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_fixture.h"
#include "thread_count.h"
#include "vyrservice.h"
#include "vyrservice_test_peer.h"
#include "work_log.h"

namespace vyr_service_test {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;
using aidl::android::vyr::IVYRService;
using android::vyr::binder::ServiceConfig;
using android::vyr::binder::VYRService;
using namespace std::chrono_literals;

using vyr_test::Hex;
using vyr_test::kAlsProperty;
using vyr_test::kNoDisplayPath;
using vyr_test::kRangeProperty;
using vyr_test::kTag;
using vyr_test::kWait;
using vyr_test::RecordingCallback;
using vyr_test::ThreadCount;
using vyr_test::WaitForThreadCount;

// Builds the service on the sensor doubles with a scripted property source and no start-up
// delay. Checks at the end of each test that no thread of the service is left.
class ServiceTest : public vyr_test::ServiceFixture {
  protected:
    void SetUp() override;
    void TearDown() override;

    // Both sensors present unless said otherwise; returns once the display monitor has ended.
    void MakeService(bool als = true, bool range = true);
    void MakeService(const ServiceConfig& config);
    // Drops the test's reference; the service is destroyed here.
    void DestroyService();

    int32_t Open(int32_t mode);
    int32_t Enable(int32_t handle, int32_t period);
    // Opens a client of `mode` and enables it; waits until the worker has applied the item.
    int32_t OpenAndEnable(int32_t mode, int32_t period);
    // Disables and waits until the worker has applied the item.
    void DisableAndWait(int32_t handle);
    std::shared_ptr<VYRService> impl_;
    std::shared_ptr<IVYRService> service_;
    size_t baseline_threads_ = 0;
    // Mode of every handle opened through Open().
    std::map<int32_t, int32_t> modes_;
};

}  // namespace vyr_service_test
