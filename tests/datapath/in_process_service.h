// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Fixture: the service built in this process on the sensor test doubles, with no start-up delay
// and no display monitor input. Every test leaves it with all its clients disabled and the
// workers idle, so that destroying it joins nothing that is still sampling.

#include <aidl/android/vyr/Event.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <set>
#include <vector>

#include "log_capture.h"
#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_fixture.h"
#include "vyrservice.h"
#include "vyrservice_test_peer.h"

namespace vyr_datapath {

using vyr_test::RecordingCallback;

constexpr int32_t kAls = 1;
constexpr int32_t kRange = 3;
using vyr_test::kTag;
using vyr_test::kWait;

// A valid one-zone range record of sensor time `time_ms`.
MultiRangingData RangeFrame(uint32_t time_ms);

class InProcessServiceTest : public vyr_test::ServiceFixture {
  protected:
    void SetUp() override;
    void TearDown() override;

    // Rebuilds the service with the light sensor's property set as given.
    void StartService(bool als_property);

    // Open that must succeed; the handle is disabled and closed at tear-down.
    int32_t OpenOk(int32_t mode);
    // Enable that must succeed.
    void EnableOk(int32_t handle, int32_t period_ms);
    void DisableNow(int32_t handle);
    int32_t Poll(int32_t handle, aidl::android::vyr::Event* event);

    // Holds the sensor read of `mode`, enables `handle` (of that mode) at `period_ms` and lets
    // exactly one sample through: afterwards that sample is stored and the next read is held, so
    // nothing replaces it until PublishNextSample.
    void StartHeldSampling(int32_t handle, int32_t mode, int32_t period_ms = 1);
    // Lets exactly one more sample of the held mode through.
    void PublishNextSample();
    // Waits until both mode blocks have no enable in force and no sampling thread.
    void WaitForIdleWorkers();

    static const char* ReadCallOf(int32_t mode);

    std::shared_ptr<RecordingCallback> NewCallback();

    std::shared_ptr<android::vyr::binder::VYRService> service_;

  private:
    std::set<int32_t> opened_;
    std::set<int32_t> enabled_;
    const char* held_call_ = nullptr;
};

}  // namespace vyr_datapath
