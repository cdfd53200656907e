// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The sensor libraries' headers assert their record layouts at compile time; compiling them here
// keeps those checks in the build. The runtime checks restate the sizes the service copies.

#include <gtest/gtest.h>

#include <type_traits>

#include "ambient_light_sensor.h"
#include "ubk/range_sensor.h"

namespace vyr_test::sensors {
namespace {

static_assert(std::is_trivially_copyable_v<ALSResult>);
static_assert(std::is_trivially_copyable_v<MultiRangingData>);
static_assert(std::is_trivially_copyable_v<ControlSettings>);
static_assert(sizeof(MultiRangingData::zones) / sizeof(RangingZone) == kMaxRangingZones);

TEST(SensorLayoutTest, RecordSizes) {
    EXPECT_EQ(sizeof(ALSResult), 48u);
    EXPECT_EQ(sizeof(RangingZone), 28u);
    EXPECT_EQ(sizeof(MultiRangingData), 132u);
    EXPECT_EQ(sizeof(ControlSettings), 36u);
    EXPECT_EQ(kMaxRangingZones, 4);
}

}  // namespace
}  // namespace vyr_test::sensors
