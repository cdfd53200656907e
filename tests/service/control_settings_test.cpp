// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "control_settings.h"

#include <gtest/gtest.h>

#include <vector>

namespace vyr_test::service {
namespace {

using android::vyr::binder::kControlSettingsCount;
using android::vyr::binder::ToControlSettings;

TEST(ControlSettingsTest, EachValueLandsInItsField) {
    const std::vector<int32_t> values = {30, 33, 1500, 40, 1, 1, 1, 2, 10, 4000, 64};
    ASSERT_EQ(values.size(), kControlSettingsCount);
    const ControlSettings settings = ToControlSettings(values);
    EXPECT_EQ(settings.frame_rate_hz, 30);
    EXPECT_EQ(settings.timing_budget_ms, 33);
    EXPECT_EQ(settings.signal_threshold, 1500);
    EXPECT_EQ(settings.sigma_threshold_mm, 40);
    EXPECT_TRUE(settings.smudge_correction);
    EXPECT_TRUE(settings.crosstalk_correction);
    EXPECT_TRUE(settings.ambient_correction);
    EXPECT_EQ(settings.reserved, 0);
    EXPECT_EQ(settings.distance_mode, 2);
    EXPECT_EQ(settings.range_min_mm, 10);
    EXPECT_EQ(settings.range_max_mm, 4000);
    EXPECT_EQ(settings.zone_layout, 64);
}

TEST(ControlSettingsTest, ACorrectionIsOnOnlyForExactlyOne) {
    const ControlSettings settings = ToControlSettings({0, 0, 0, 0, 2, -1, 0, 0, 0, 0, 0});
    EXPECT_FALSE(settings.smudge_correction);
    EXPECT_FALSE(settings.crosstalk_correction);
    EXPECT_FALSE(settings.ambient_correction);
}

TEST(ControlSettingsTest, ExtremeValuesPassUnchanged) {
    const ControlSettings settings =
        ToControlSettings({INT32_MIN, INT32_MAX, -1, 0, 1, 0, 1, INT32_MIN, -5, INT32_MAX, -64});
    EXPECT_EQ(settings.frame_rate_hz, INT32_MIN);
    EXPECT_EQ(settings.timing_budget_ms, INT32_MAX);
    EXPECT_EQ(settings.signal_threshold, -1);
    EXPECT_TRUE(settings.smudge_correction);
    EXPECT_FALSE(settings.crosstalk_correction);
    EXPECT_TRUE(settings.ambient_correction);
    EXPECT_EQ(settings.distance_mode, INT32_MIN);
    EXPECT_EQ(settings.range_min_mm, -5);
    EXPECT_EQ(settings.range_max_mm, INT32_MAX);
    EXPECT_EQ(settings.zone_layout, -64);
}

}  // namespace
}  // namespace vyr_test::service
