// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "sensor_doubles.h"

namespace sensor_doubles {

// The one recorder and script shared by both doubles and the test-facing functions of
// sensor_doubles.h, which work on its fields directly.
struct DoubleState {
    static DoubleState& Get();

    // Records the call, then blocks while the name is held, then sleeps its delay. Returns the
    // scripted result.
    int OnCall(const char* name, std::vector<int64_t> args,
               const ControlSettings* settings = nullptr);

    MultiRangingData NextRangeData();
    ALSResult NextAlsData();

    bool AlsCreateFails();
    bool RangeCreateFails();
    // The library's instance, whose enabled flag every recorded call samples.
    void SetAlsInstance(AmbientLightSensor* instance);

    struct HoldState {
        bool held = false;
        // Bumped by every release so a blocked call cannot miss one that is followed at once by
        // a new Hold.
        uint64_t generation = 0;
        // Calls blocked by the current hold; calls already released no longer count.
        size_t blocked = 0;
    };

    size_t CountLocked(const std::string& name) const;
    void ReleaseLocked(HoldState& hold);

    std::mutex mutex;
    std::condition_variable changed;
    std::vector<Call> calls;
    std::map<std::string, int> results;
    std::map<std::string, std::chrono::milliseconds> delays;
    std::map<std::string, HoldState> holds;
    std::deque<MultiRangingData> range_queue;
    std::deque<ALSResult> als_queue;
    MultiRangingData range_data{};
    ALSResult als_data{};
    bool als_create_fails = false;
    bool range_create_fails = false;
    AmbientLightSensor* als_instance = nullptr;
};

}  // namespace sensor_doubles
