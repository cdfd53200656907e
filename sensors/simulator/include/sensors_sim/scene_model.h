// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>

#include "ambient_light_sensor.h"
#include "ubk/range_sensor.h"

namespace sensors_sim {

// The simulated scene both sensors look at: one target in front of a 2x2-zone range sensor that
// drifts smoothly back and forth, and room light that the camera torch can add to. Every value is
// a pure function of the seed and the sample's index or time offset, so a seed replays exactly.
class SceneModel {
  public:
    explicit SceneModel(uint64_t seed);

    // Target distance, in millimetres, `time_ms` after ranging started (zone offsets excluded).
    double TargetDistanceMm(double time_ms) const;

    // Fills zones[0..zone_count) of frame `frame_number`, measured `time_ms` after ranging
    // started, and zeroes the rest. Header fields are the caller's.
    void FillZones(uint32_t frame_number, double time_ms, int zone_count,
                   MultiRangingData* data) const;

    // The light reading number `index`, integrated over `integration_ms`. Timestamp and
    // validity are the caller's.
    ALSResult LightSample(uint64_t index, bool torch_lit, unsigned integration_ms) const;

    // Die temperature of the range sensor, in degrees Celsius.
    int16_t TemperatureC(double time_ms) const;

  private:
    // Deterministic noise in [-1, 1) for one stream of the scene and one sample.
    double Noise(uint64_t stream, uint64_t index) const;

    uint64_t seed_;
    double base_distance_mm_;
    double swing_mm_;
    double swing_period_ms_;
    double swing_phase_;
    double zone_offset_mm_[kMaxRangingZones];
    double reflectance_;
    double ambient_rate_;
    double room_lux_;
    double room_cct_k_;
    double light_phase_;
    double torch_lux_;
};

}  // namespace sensors_sim
