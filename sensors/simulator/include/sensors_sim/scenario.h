// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>
#include <string>

namespace sensors_sim {

// What a scenario file can script about the simulated sensors. Defaults describe a healthy pair.
struct Scenario {
    bool als_create_fails = false;
    bool range_create_fails = false;
    bool range_init_fails = false;
    // Every Nth sample of each sensor is marked invalid; 0 never.
    int invalid_every = 0;
    // Added to every blocking read, on top of the sensor's own timing.
    int extra_latency_ms = 0;
    // Zones reported per range frame, 0..kMaxRangingZones (4 is the full 2x2 grid).
    int zone_count = 4;
    uint64_t seed = 1;
    // A recording (vyrctl stream --json) that the sensor plays back instead of the synthetic
    // scene, from the start again at its end when `*_replay_loop`; a relative path is taken
    // from the scenario file's folder.
    std::string range_replay;
    bool range_replay_loop = false;
    std::string als_replay;
    bool als_replay_loop = false;
};

inline constexpr char kScenarioVariable[] = "VYR_SENSOR_SCENARIO";

// Reads `key=value` lines (`#` comments, blank lines, whitespace around both ignored). Unknown
// keys and bad values are logged and leave the default; an unreadable file gives all defaults.
Scenario ParseScenarioFile(const std::string& path);

// The scenario named by VYR_SENSOR_SCENARIO, or the defaults when it is unset.
Scenario LoadScenario();

}  // namespace sensors_sim
