// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>

namespace android {
namespace vyr {
namespace binder {

// Sensor modes as clients name them.
constexpr int32_t kAlsMode = 1;
constexpr int32_t kRangeMode = 3;
// Sensor types: the index of a sensor's worker, queue and sensor lock.
constexpr unsigned int kAlsSensorType = 0;
constexpr unsigned int kRangeSensorType = 1;

// The arguments every sample is read with; their meaning is the sensor libraries' (a blocking
// read and a 30 ms integration for the light sensor, the multi-zone mode for the range sensor).
constexpr bool kAlsReadWait = true;
constexpr unsigned char kAlsIntegrationMs = 30;
constexpr int kRangeProcessMode = 3;

}  // namespace binder
}  // namespace vyr
}  // namespace android
