// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstddef>
#include <cstdint>

// One zone of a multi-zone range measurement.
struct RangingZone {
    uint8_t target_status;
    int16_t distance_mm;
    int16_t sigma_mm;
    uint32_t signal_rate;
    uint32_t ambient_rate;
    uint32_t spad_count;
    int16_t min_distance_mm;
    uint8_t target_count;
    uint8_t confidence;
    uint8_t reflectance;
    uint8_t flags;
};

static_assert(offsetof(RangingZone, target_status) == 0);
static_assert(offsetof(RangingZone, distance_mm) == 2);
static_assert(offsetof(RangingZone, sigma_mm) == 4);
static_assert(offsetof(RangingZone, signal_rate) == 8);
static_assert(offsetof(RangingZone, ambient_rate) == 12);
static_assert(offsetof(RangingZone, spad_count) == 16);
static_assert(offsetof(RangingZone, min_distance_mm) == 20);
static_assert(offsetof(RangingZone, target_count) == 22);
static_assert(offsetof(RangingZone, confidence) == 23);
static_assert(offsetof(RangingZone, reflectance) == 24);
static_assert(offsetof(RangingZone, flags) == 25);
static_assert(sizeof(RangingZone) == 28);

constexpr int kMaxRangingZones = 4;

// One frame of the range sensor.
struct MultiRangingData {
    uint32_t time_ms;
    uint8_t stream_count;
    uint8_t device_status;
    uint8_t zone_count;
    uint8_t frame_flags;
    RangingZone zones[kMaxRangingZones];
    uint8_t range_state;
    uint16_t effective_rate;
    int16_t temperature_c;
    uint8_t error_flags;
    uint8_t valid;
    uint32_t frame_number;
};

static_assert(offsetof(MultiRangingData, time_ms) == 0);
static_assert(offsetof(MultiRangingData, stream_count) == 4);
static_assert(offsetof(MultiRangingData, device_status) == 5);
static_assert(offsetof(MultiRangingData, zone_count) == 6);
static_assert(offsetof(MultiRangingData, frame_flags) == 7);
static_assert(offsetof(MultiRangingData, zones) == 8);
static_assert(offsetof(MultiRangingData, range_state) == 120);
static_assert(offsetof(MultiRangingData, effective_rate) == 122);
static_assert(offsetof(MultiRangingData, temperature_c) == 124);
static_assert(offsetof(MultiRangingData, error_flags) == 126);
static_assert(offsetof(MultiRangingData, valid) == 127);
static_assert(offsetof(MultiRangingData, frame_number) == 128);
static_assert(sizeof(MultiRangingData) == 132);

// Settings a range client may send; the service fills every field.
struct ControlSettings {
    int32_t frame_rate_hz;
    int32_t timing_budget_ms;
    int32_t signal_threshold;
    int32_t sigma_threshold_mm;
    bool smudge_correction;
    bool crosstalk_correction;
    bool ambient_correction;
    uint8_t reserved;
    int32_t distance_mode;
    int32_t range_min_mm;
    int32_t range_max_mm;
    int32_t zone_layout;
};

static_assert(offsetof(ControlSettings, frame_rate_hz) == 0);
static_assert(offsetof(ControlSettings, timing_budget_ms) == 4);
static_assert(offsetof(ControlSettings, signal_threshold) == 8);
static_assert(offsetof(ControlSettings, sigma_threshold_mm) == 12);
static_assert(offsetof(ControlSettings, smudge_correction) == 16);
static_assert(offsetof(ControlSettings, crosstalk_correction) == 17);
static_assert(offsetof(ControlSettings, ambient_correction) == 18);
static_assert(offsetof(ControlSettings, reserved) == 19);
static_assert(offsetof(ControlSettings, distance_mode) == 20);
static_assert(offsetof(ControlSettings, range_min_mm) == 24);
static_assert(offsetof(ControlSettings, range_max_mm) == 28);
static_assert(offsetof(ControlSettings, zone_layout) == 32);
static_assert(sizeof(ControlSettings) == 36);

namespace ubk {

// The range sensor library. One instance per process, made by Create() and released by Destroy().
class RangeSensor {
  public:
    static RangeSensor* Create();
    static void Destroy();

    int Init();
    int Uninit();
    int Enable(bool enable);
    // Blocks until the next frame is ready and fills it.
    int Process(int mode, MultiRangingData* data);
    int ConfigureParameters(const ControlSettings& settings);

  private:
    RangeSensor() = default;
    ~RangeSensor() = default;
    RangeSensor(const RangeSensor&) = delete;
    RangeSensor& operator=(const RangeSensor&) = delete;
};

}  // namespace ubk
