// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Fixture of the in-process data path tests: the service with both sensors and no display
// monitor input, made before each test. Every test leaves it with all its clients disabled and
// the workers idle, so that destroying it joins nothing that is still sampling. Sensor reads can
// be held, so that a test decides when each sample is taken.

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>

#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_fixture.h"

namespace vyr_test::datapath {

constexpr int32_t kAls = 1;
constexpr int32_t kRange = 3;

// A valid one-zone range record of sensor time `time_ms`.
MultiRangingData RangeFrame(uint32_t time_ms);

class DataPathTest : public vyr_test::ServiceFixture {
  protected:
    void SetUp() override;
    void TearDown() override;

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
    // A new callback set on `handle`, which must take it.
    std::shared_ptr<RecordingCallback> SetCallbackOk(int32_t handle);

  private:
    const char* held_call_ = nullptr;
};

}  // namespace vyr_test::datapath
