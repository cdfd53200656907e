// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "event_conversion.h"

#include <gtest/gtest.h>

namespace vyr_test::service {
namespace {

using aidl::android::vyr::Event;
using android::vyr::binder::ConvertAlsResult;
using android::vyr::binder::ConvertRangingData;

TEST(EventConversionTest, AmbientLightReadingSwapsTheLastTwoChannels) {
    ALSResult result{};
    result.status = 0xF0;
    result.channels[0] = 1.5f;
    result.channels[1] = 2.5f;
    result.channels[2] = 3.5f;
    result.channels[3] = 4.5f;
    result.channels[4] = 5.5f;
    result.reserved = 77;
    result.lux = 100.25f;
    result.color_temperature = 6500.0f;
    result.valid = 1;
    result.timestamp_ns = -123456789012345;
    Event event{};
    event.data = {9, 9, 9, 9, 9, 9, 9};
    ConvertAlsResult(result, &event);
    EXPECT_EQ(0xF0, event.status) << "a status byte with its top bit set reaches clients positive";
    EXPECT_EQ(-123456789012345, event.timestamp);
    EXPECT_EQ(6500.0f, event.value0);
    EXPECT_EQ(100.25f, event.value1);
    EXPECT_EQ((std::vector<float>{1.5f, 2.5f, 3.5f, 5.5f, 4.5f}), event.data);
}

MultiRangingData Frame(uint8_t zone_count) {
    MultiRangingData data{};
    data.time_ms = 0xFFFFFFF0u;
    data.stream_count = 200;
    data.device_status = 2;
    data.zone_count = zone_count;
    data.frame_flags = 255;
    for (int i = 0; i < kMaxRangingZones; ++i) {
        RangingZone& zone = data.zones[i];
        zone.target_status = static_cast<uint8_t>(250 + i);
        zone.distance_mm = static_cast<int16_t>(-1000 - i);
        zone.sigma_mm = static_cast<int16_t>(30 + i);
        zone.signal_rate = 4000000000u + i;
        zone.ambient_rate = 7u + i;
        zone.spad_count = 100u + i;
        zone.min_distance_mm = static_cast<int16_t>(-5 - i);
        zone.target_count = static_cast<uint8_t>(1 + i);
        zone.confidence = static_cast<uint8_t>(90 + i);
        zone.reflectance = static_cast<uint8_t>(40 + i);
        zone.flags = static_cast<uint8_t>(0x80 + i);
    }
    data.range_state = 3;
    data.effective_rate = 65535;
    data.temperature_c = -40;
    data.error_flags = 0xAA;
    data.valid = 1;
    data.frame_number = 123456;
    return data;
}

std::vector<float> Header(const MultiRangingData& data) {
    return {
        static_cast<float>(0xFFFFFFF0u),     200,   2, 255, 3, 65535, -40, static_cast<float>(0xAA),
        static_cast<float>(data.zone_count), 123456};
}

TEST(EventConversionTest, RangeFrameWithoutZonesGivesTheHeaderOnly) {
    const MultiRangingData data = Frame(0);
    Event event{};
    event.status = 5;
    event.value0 = 1;
    event.value1 = 2;
    ConvertRangingData(data, &event);
    EXPECT_EQ(0, event.status);
    EXPECT_EQ(static_cast<int64_t>(0xFFFFFFF0u), event.timestamp);
    EXPECT_EQ(0.0f, event.value0);
    EXPECT_EQ(0.0f, event.value1);
    EXPECT_EQ(Header(data), event.data);
}

TEST(EventConversionTest, RangeFrameAppendsElevenValuesPerZone) {
    const MultiRangingData data = Frame(2);
    Event event{};
    ConvertRangingData(data, &event);
    ASSERT_EQ(32u, event.data.size());
    std::vector<float> expected = Header(data);
    for (int i = 0; i < 2; ++i) {
        const RangingZone& z = data.zones[i];
        expected.insert(expected.end(),
                        {static_cast<float>(z.target_status), static_cast<float>(z.distance_mm),
                         static_cast<float>(z.sigma_mm), static_cast<float>(z.signal_rate),
                         static_cast<float>(z.ambient_rate), static_cast<float>(z.spad_count),
                         static_cast<float>(z.min_distance_mm), static_cast<float>(z.target_count),
                         static_cast<float>(z.confidence), static_cast<float>(z.reflectance),
                         static_cast<float>(z.flags)});
    }
    EXPECT_EQ(expected, event.data);
    EXPECT_EQ(250.0f, event.data[10]);
    EXPECT_EQ(-1000.0f, event.data[11]);
    EXPECT_EQ(4000000000.0f, event.data[13]);
}

TEST(EventConversionTest, ZoneCountBeyondTheZoneArrayReadsOnlyTheArray) {
    const MultiRangingData data = Frame(200);
    Event event{};
    ConvertRangingData(data, &event);
    EXPECT_EQ(10u + 11u * kMaxRangingZones, event.data.size());
    EXPECT_EQ(200.0f, event.data[8]);
}

}  // namespace
}  // namespace vyr_test::service
