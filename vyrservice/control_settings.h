// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "ubk/range_sensor.h"

namespace android {
namespace vyr {
namespace binder {

// ConfigureParameters takes exactly this many values.
constexpr size_t kControlSettingsCount = 11;

// The range sensor's settings from ConfigureParameters' values, in the interface's order: frame
// rate, timing budget, signal and sigma thresholds, the smudge, crosstalk and ambient corrections
// (on only for exactly 1), distance mode, minimum and maximum range, zone layout. `values` holds
// kControlSettingsCount of them.
ControlSettings ToControlSettings(const std::vector<int32_t>& values);

}  // namespace binder
}  // namespace vyr
}  // namespace android
