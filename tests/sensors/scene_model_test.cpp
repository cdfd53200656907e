// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensors_sim/scene_model.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>

namespace vyr_test::sensors {
namespace {

using sensors_sim::SceneModel;

constexpr double kFrameMs = 1000.0 / 30.0;

MultiRangingData Frame(const SceneModel& scene, uint32_t frame, int zones = 4) {
    MultiRangingData data{};
    scene.FillZones(frame, frame * kFrameMs, zones, &data);
    return data;
}

TEST(SceneModelTest, SameSeedGivesSameData) {
    const SceneModel a(7), b(7);
    for (uint32_t frame = 0; frame < 200; ++frame) {
        const MultiRangingData fa = Frame(a, frame), fb = Frame(b, frame);
        ASSERT_EQ(memcmp(&fa, &fb, sizeof(fa)), 0) << frame;
        const ALSResult la = a.LightSample(frame, frame % 2 == 0, 30);
        const ALSResult lb = b.LightSample(frame, frame % 2 == 0, 30);
        ASSERT_EQ(memcmp(&la, &lb, sizeof(la)), 0) << frame;
    }
}

TEST(SceneModelTest, DifferentSeedsGiveDifferentData) {
    const SceneModel a(7), b(8);
    int differing_frames = 0;
    int differing_samples = 0;
    for (uint32_t frame = 0; frame < 50; ++frame) {
        const MultiRangingData fa = Frame(a, frame), fb = Frame(b, frame);
        if (fa.zones[0].distance_mm != fb.zones[0].distance_mm) ++differing_frames;
        if (a.LightSample(frame, false, 30).lux != b.LightSample(frame, false, 30).lux) {
            ++differing_samples;
        }
    }
    EXPECT_GT(differing_frames, 40);
    EXPECT_GT(differing_samples, 40);
}

TEST(SceneModelTest, TargetMovesSmoothlyOverARealisticRange) {
    const SceneModel scene(3);
    double low = 1e9, high = -1e9;
    double previous = scene.TargetDistanceMm(0.0);
    for (int frame = 1; frame < 30 * 20; ++frame) {
        const double d = scene.TargetDistanceMm(frame * kFrameMs);
        EXPECT_LT(std::abs(d - previous), 20.0) << frame;
        previous = d;
        low = std::min(low, d);
        high = std::max(high, d);
    }
    EXPECT_GE(low, 100.0);
    EXPECT_LE(high, 2500.0);
    EXPECT_GT(high - low, 250.0) << "the target should move within 20 s";
}

TEST(SceneModelTest, ZonesArePlausibleAndFollowTheTarget) {
    const SceneModel scene(11);
    for (uint32_t frame = 0; frame < 300; frame += 7) {
        const MultiRangingData data = Frame(scene, frame);
        const double target = scene.TargetDistanceMm(frame * kFrameMs);
        for (const RangingZone& zone : data.zones) {
            EXPECT_EQ(zone.target_status, 5);
            EXPECT_NEAR(zone.distance_mm, target, 150.0);
            EXPECT_GT(zone.sigma_mm, 0);
            EXPECT_LT(zone.sigma_mm, 100);
            EXPECT_GT(zone.signal_rate, 0u);
            EXPECT_GT(zone.ambient_rate, 0u);
            EXPECT_GT(zone.spad_count, 0u);
            EXPECT_LE(zone.min_distance_mm, zone.distance_mm);
            EXPECT_EQ(zone.target_count, 1);
            EXPECT_LE(zone.confidence, 100);
            EXPECT_LE(zone.reflectance, 100);
        }
    }
}

TEST(SceneModelTest, SignalFallsWithDistance) {
    const SceneModel scene(5);
    uint32_t near_frame = 0, far_frame = 0;
    for (uint32_t frame = 0; frame < 30 * 20; ++frame) {
        const double d = scene.TargetDistanceMm(frame * kFrameMs);
        if (d < scene.TargetDistanceMm(near_frame * kFrameMs)) near_frame = frame;
        if (d > scene.TargetDistanceMm(far_frame * kFrameMs)) far_frame = frame;
    }
    const MultiRangingData near = Frame(scene, near_frame), far = Frame(scene, far_frame);
    EXPECT_GT(near.zones[0].signal_rate, far.zones[0].signal_rate);
    EXPECT_LE(near.zones[0].sigma_mm, far.zones[0].sigma_mm);
}

TEST(SceneModelTest, ZoneCountLimitsTheFilledZones) {
    const SceneModel scene(2);
    for (int zones = 0; zones <= 4; ++zones) {
        const MultiRangingData data = Frame(scene, 10, zones);
        for (int zone = 0; zone < 4; ++zone) {
            EXPECT_EQ(data.zones[zone].distance_mm != 0, zone < zones) << zones << " " << zone;
        }
    }
}

TEST(SceneModelTest, TorchRaisesLuxAndShiftsColourTemperature) {
    for (uint64_t seed : {1u, 2u, 3u, 4u}) {
        const SceneModel scene(seed);
        const ALSResult dark = scene.LightSample(10, false, 30);
        const ALSResult lit = scene.LightSample(10, true, 30);
        EXPECT_GT(lit.lux, dark.lux + 500.0f) << seed;
        EXPECT_GT(std::abs(lit.color_temperature - dark.color_temperature), 50.0f) << seed;
        // The mix lies between the room's light and the torch's.
        EXPECT_LE(std::min(lit.color_temperature, 5600.0f), 5600.0f);
        EXPECT_GE(lit.color_temperature, std::min(dark.color_temperature, 5600.0f) - 1.0f);
        EXPECT_LE(lit.color_temperature, std::max(dark.color_temperature, 5600.0f) + 1.0f);
        for (int channel = 0; channel < 5; ++channel) {
            EXPECT_GT(dark.channels[channel], 0.0f);
        }
        EXPECT_GT(lit.channels[3], dark.channels[3]);
    }
}

TEST(SceneModelTest, ChannelsScaleWithIntegrationTime) {
    const SceneModel scene(9);
    const ALSResult short_read = scene.LightSample(4, false, 30);
    const ALSResult long_read = scene.LightSample(4, false, 60);
    for (int channel = 0; channel < 5; ++channel) {
        EXPECT_NEAR(long_read.channels[channel], 2.0f * short_read.channels[channel],
                    0.01f * long_read.channels[channel]);
    }
    EXPECT_EQ(long_read.lux, short_read.lux);
}

TEST(SceneModelTest, LightDriftsSlowly) {
    const SceneModel scene(6);
    for (uint64_t i = 1; i < 400; ++i) {
        const float previous = scene.LightSample(i - 1, false, 30).lux;
        const float current = scene.LightSample(i, false, 30).lux;
        EXPECT_LT(std::abs(current - previous), 0.05f * previous) << i;
    }
}

}  // namespace
}  // namespace vyr_test::sensors
