// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Recordings (vyrctl stream --json) read back into the sensor libraries' records: field by field
// as the service's conversion reads them, on the recording's own time line, and bad files refused
// with the file and line.

#include "sensors_sim/recording.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "event_conversion.h"
#include "event_format.h"
#include "options.h"
#include "temp_dir.h"

namespace vyr_test::sensors {
namespace {

using aidl::android::vyr::Event;
using sensors_sim::Recording;

MultiRangingData RangeRecord(uint32_t time_ms, uint8_t zones) {
    MultiRangingData data{};
    data.time_ms = time_ms;
    data.stream_count = 7;
    data.device_status = 2;
    data.zone_count = zones;
    data.frame_flags = 9;
    data.range_state = 1;
    data.effective_rate = 30;
    data.temperature_c = -4;
    data.error_flags = 3;
    data.valid = 1;
    data.frame_number = 123456;
    for (int i = 0; i < zones; ++i) {
        RangingZone& zone = data.zones[i];
        zone.target_status = static_cast<uint8_t>(5 + i);
        zone.distance_mm = static_cast<int16_t>(-1200 + 17 * i);
        zone.sigma_mm = static_cast<int16_t>(3 + i);
        zone.signal_rate = 16000000u + i;
        zone.ambient_rate = 44u + i;
        zone.spad_count = 1200u + i;
        zone.min_distance_mm = static_cast<int16_t>(-1300 + i);
        zone.target_count = 1;
        zone.confidence = static_cast<uint8_t>(90 + i);
        zone.reflectance = static_cast<uint8_t>(40 + i);
        zone.flags = static_cast<uint8_t>(i);
    }
    return data;
}

ALSResult LightRecord(int64_t timestamp_ns) {
    ALSResult result{};
    result.status = 0;
    for (int i = 0; i < 5; ++i) result.channels[i] = 1000.5f * static_cast<float>(i + 1);
    result.lux = 321.25f;
    result.color_temperature = 4100.75f;
    result.valid = 1;
    result.timestamp_ns = timestamp_ns;
    return result;
}

// One line of a recording, as vyrctl stream --json prints the event.
std::string RangeLine(const MultiRangingData& data) {
    Event event;
    android::vyr::binder::ConvertRangingData(data, &event);
    return vyrctl::FormatEventJson(vyrctl::kModeRange, 77, event, 0);
}

std::string LightLine(const ALSResult& result) {
    Event event;
    android::vyr::binder::ConvertAlsResult(result, &event);
    return vyrctl::FormatEventJson(vyrctl::kModeAls, 77, event, 0);
}

class RecordingTest : public ::testing::Test {
  protected:
    std::optional<Recording> Load(const std::vector<std::string>& lines, Recording::Sensor sensor,
                                  bool loop = false) {
        std::string text;
        for (const std::string& line : lines) text += line + "\n";
        path_ = dir_.Write("recording.jsonl", text);
        error_.clear();
        return Recording::Load(path_, sensor, loop, &error_);
    }
    // The error for a file whose line 2 is `line`, after a good first line.
    std::string RangeErrorAtLine2(const std::string& line) {
        EXPECT_FALSE(Load({RangeLine(RangeRecord(0, 1)), line}, Recording::Sensor::kRange));
        return error_;
    }

    TempDir dir_;
    std::string path_;
    std::string error_;
};

TEST_F(RecordingTest, RangeRecordsAreRebuiltFieldByField) {
    for (uint8_t zones = 0; zones <= kMaxRangingZones; ++zones) {
        const MultiRangingData original = RangeRecord(4000000, zones);
        auto recording = Load({RangeLine(original)}, Recording::Sensor::kRange);
        ASSERT_TRUE(recording) << error_;
        const MultiRangingData rebuilt = recording->Next(0).sample->range;
        EXPECT_EQ(0, memcmp(&original, &rebuilt, sizeof(original))) << zones << " zones";
    }
}

TEST_F(RecordingTest, LightRecordsAreRebuiltFieldByField) {
    const ALSResult original = LightRecord(987654321012345678);
    auto recording = Load({LightLine(original)}, Recording::Sensor::kLight);
    ASSERT_TRUE(recording) << error_;
    const ALSResult& rebuilt = recording->Next(0).sample->light;
    EXPECT_EQ(rebuilt.timestamp_ns, original.timestamp_ns);
    EXPECT_EQ(rebuilt.status, original.status);
    EXPECT_EQ(rebuilt.lux, original.lux);
    EXPECT_EQ(rebuilt.color_temperature, original.color_temperature);
    EXPECT_EQ(rebuilt.valid, 1);
    for (int i = 0; i < 5; ++i) EXPECT_EQ(rebuilt.channels[i], original.channels[i]) << i;
}

TEST_F(RecordingTest, AReadTakesTheLatestRecordNotAfterItsTimeAndNeverOneTwice) {
    auto recording = Load({RangeLine(RangeRecord(1000, 1)), RangeLine(RangeRecord(1100, 1)),
                           RangeLine(RangeRecord(1200, 1)), RangeLine(RangeRecord(1300, 1))},
                          Recording::Sensor::kRange);
    ASSERT_TRUE(recording) << error_;
    EXPECT_EQ(recording->Next(0).sample->range.time_ms, 1000u);
    // Ahead of the recording: the next record is due at 100 ms.
    const Recording::Pick early = recording->Next(50);
    EXPECT_EQ(early.sample, nullptr);
    EXPECT_EQ(early.ready_at_ms, 100);
    // Behind it: a record is skipped.
    EXPECT_EQ(recording->Next(250).sample->range.time_ms, 1200u);
    EXPECT_EQ(recording->Next(300).sample->range.time_ms, 1300u);
    // The end without a loop: the last record stays.
    EXPECT_EQ(recording->Next(310).sample->range.time_ms, 1300u);
    EXPECT_EQ(recording->Next(5000).sample->range.time_ms, 1300u);
    recording->Restart();
    EXPECT_EQ(recording->Next(0).sample->range.time_ms, 1000u);
}

TEST_F(RecordingTest, ALoopStartsOverOneMeanGapAfterTheLastRecord) {
    auto recording = Load({LightLine(LightRecord(5000000)), LightLine(LightRecord(105000000)),
                           LightLine(LightRecord(205000000))},
                          Recording::Sensor::kLight, /*loop=*/true);
    ASSERT_TRUE(recording) << error_;
    std::vector<int64_t> seen;
    for (double t = 0; t < 650; t += 100) {
        const Recording::Pick pick = recording->Next(t);
        ASSERT_NE(pick.sample, nullptr) << t;
        seen.push_back(pick.sample->light.timestamp_ns);
    }
    EXPECT_EQ(seen, (std::vector<int64_t>{5000000, 105000000, 205000000, 5000000, 105000000,
                                          205000000, 5000000}));
    EXPECT_EQ(recording->Next(620).ready_at_ms, 700);
}

TEST_F(RecordingTest, ALineMarkedInvalidGivesAnInvalidSample) {
    auto recording = Load({RangeLine(RangeRecord(0, 2)),
                           R"({"format":1,"sensor":"range","timestamp":100,"valid":false})"},
                          Recording::Sensor::kRange);
    ASSERT_TRUE(recording) << error_;
    EXPECT_EQ(recording->Next(0).sample->range.valid, 1);
    const MultiRangingData& invalid = recording->Next(100).sample->range;
    EXPECT_EQ(invalid.valid, 0);
    EXPECT_EQ(invalid.time_ms, 100u);
}

TEST_F(RecordingTest, BadFilesAreRefusedWithTheFileAndLine) {
    EXPECT_FALSE(
        Recording::Load(dir_.Path("missing.jsonl"), Recording::Sensor::kRange, false, &error_));
    EXPECT_EQ(error_, dir_.Path("missing.jsonl") + ": cannot be read");
    EXPECT_FALSE(Load({""}, Recording::Sensor::kRange));
    EXPECT_EQ(error_, path_ + ": no records");

    EXPECT_EQ(RangeErrorAtLine2("{\"sensor\":\"range\""), path_ + ":2: not a JSON object");
    EXPECT_EQ(RangeErrorAtLine2(LightLine(LightRecord(1))),
              path_ + ":2: not a record of the range sensor");
    EXPECT_EQ(RangeErrorAtLine2(R"({"sensor":"range","timestamp":1.5})"),
              path_ + ":2: no whole \"timestamp\"");
    EXPECT_EQ(RangeErrorAtLine2(R"({"sensor":"range","timestamp":5,"valid":"no"})"),
              path_ + ":2: \"valid\" is not true or false");
    EXPECT_EQ(RangeErrorAtLine2(R"({"sensor":"range","timestamp":5,"data":[1,2,3]})"),
              path_ + ":2: \"data\" needs the 10 header values");
    EXPECT_EQ(
        RangeErrorAtLine2(R"({"sensor":"range","timestamp":5,"data":[5,0,0,0,1,30,27,0,1,2]})"),
        path_ + ":2: \"data\" has 10 values; 1 zones need 21");
    EXPECT_EQ(
        RangeErrorAtLine2(R"({"sensor":"range","timestamp":5,"data":[5,0,0,0,1,30,27,0,0,2.5]})"),
        path_ + ":2: a value does not fit its field of the range record");
    EXPECT_EQ(
        RangeErrorAtLine2(R"({"sensor":"range","timestamp":5,"data":[5,0,0,0,1,30,27,0,9,2]})"),
        path_ + ":2: zone count (data[8]) is not 0..4");
    EXPECT_FALSE(Load({RangeLine(RangeRecord(500, 1)), RangeLine(RangeRecord(400, 1))},
                      Recording::Sensor::kRange));
    EXPECT_EQ(error_, path_ + ":2: \"timestamp\" goes back in time");
    EXPECT_FALSE(
        Load({R"({"sensor":"als","timestamp":5,"status":0,"value0":1,"value1":2,"data":[1,2]})"},
             Recording::Sensor::kLight));
    EXPECT_EQ(error_, path_ + ":1: \"data\" needs the 5 channels");
}

}  // namespace
}  // namespace vyr_test::sensors
