// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "ambient_light_sensor.h"
#include "ubk/range_sensor.h"

namespace sensors_sim {

// One sensor's events as `vyrctl stream --json` recorded them, rebuilt into the library's records
// exactly as the service's conversion reads them, and handed out again on the recording's own
// time line: a read takes the latest record whose time (relative to the first) is not after the
// time since the sensor was enabled, never one it already took, waiting for the next when it is
// ahead. Without `loop` the last record stays once reached; with it the recording starts over.
class Recording {
  public:
    enum class Sensor { kRange, kLight };

    struct Sample {
        // Milliseconds after the first record.
        double time_ms = 0;
        MultiRangingData range{};
        ALSResult light{};
    };

    // What a read gets: a sample, or the time (milliseconds after the start) when one is due.
    struct Pick {
        const Sample* sample = nullptr;
        double ready_at_ms = 0;
    };

    // The records of `path` for `sensor`; empty with `error` ("PATH:LINE: reason") when the file
    // cannot be read or a line is not a record of that sensor.
    static std::optional<Recording> Load(const std::string& path, Sensor sensor, bool loop,
                                         std::string* error);
    // What a simulator's Create() does with its scenario's replay keys (`key`, as "range.replay"):
    // loads `path` into `replay` (nothing when `path` is empty) and logs it; false, with the
    // reason logged as `part`'s failed Create, when it cannot.
    static bool LoadReplay(const std::string& path, Sensor sensor, bool loop, const char* key,
                           const char* part, std::optional<Recording>* replay);

    // Starts over at the first record: the sensor was enabled.
    void Restart() { taken_ = -1; }
    Pick Next(double elapsed_ms);
    size_t size() const { return samples_.size(); }

  private:
    Recording(std::vector<Sample> samples, bool loop);
    // Time after the start of global index `index` (pass * size + position).
    double TimeOf(int64_t index) const;

    std::vector<Sample> samples_;
    bool loop_;
    // One pass of a looping replay: the last record's time and one mean gap after it.
    double pass_ms_;
    int64_t taken_ = -1;
};

}  // namespace sensors_sim
