// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "control_settings.h"

namespace android {
namespace vyr {
namespace binder {

ControlSettings ToControlSettings(const std::vector<int32_t>& values) {
    ControlSettings settings{};
    settings.frame_rate_hz = values.at(0);
    settings.timing_budget_ms = values.at(1);
    settings.signal_threshold = values.at(2);
    settings.sigma_threshold_mm = values.at(3);
    settings.smudge_correction = values.at(4) == 1;
    settings.crosstalk_correction = values.at(5) == 1;
    settings.ambient_correction = values.at(6) == 1;
    settings.reserved = 0;
    settings.distance_mode = values.at(7);
    settings.range_min_mm = values.at(8);
    settings.range_max_mm = values.at(9);
    settings.zone_layout = values.at(10);
    return settings;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
