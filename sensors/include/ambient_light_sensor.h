// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>

// One measurement of the spectral ambient-light sensor.
struct ALSResult {
    uint8_t status;
    float channels[5];
    uint32_t reserved;
    float lux;
    float color_temperature;
    uint8_t valid;
    int64_t timestamp_ns;
};

static_assert(offsetof(ALSResult, status) == 0);
static_assert(offsetof(ALSResult, channels) == 4);
static_assert(offsetof(ALSResult, reserved) == 24);
static_assert(offsetof(ALSResult, lux) == 28);
static_assert(offsetof(ALSResult, color_temperature) == 32);
static_assert(offsetof(ALSResult, valid) == 36);
static_assert(offsetof(ALSResult, timestamp_ns) == 40);
static_assert(sizeof(ALSResult) == 48);

// The spectral sensor library. One instance per process, made by Create() and released by Destroy().
class AmbientLightSensor {
  public:
    static AmbientLightSensor* Create();
    static void Destroy();

    // Measures once; blocks for the integration time (milliseconds) when wait is set.
    int ReadSingleShot(ALSResult* result, bool wait, unsigned char integration_ms);
    // Powers the sensor down until the next read.
    int Disable();
    int SetTorchLightState(unsigned char state);

    // Written by the service's worker, read by the library on its sampling thread.
    std::atomic<bool> enabled{false};

  private:
    AmbientLightSensor() = default;
    ~AmbientLightSensor() = default;
    AmbientLightSensor(const AmbientLightSensor&) = delete;
    AmbientLightSensor& operator=(const AmbientLightSensor&) = delete;
};
