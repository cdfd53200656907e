// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensors_sim/recording.h"

#include <android/log.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <limits>
#include <nlohmann/json.hpp>
#include <type_traits>

namespace sensors_sim {
namespace {

using nlohmann::json;

constexpr char kTag[] = "sensors_sim";

// Values of the event's header before the zones, and per zone, as the conversion writes them.
constexpr size_t kRangeHeaderValues = 10;
constexpr size_t kRangeZoneValues = 11;
constexpr size_t kLightChannels = 5;
// The gap after the last record of a one-record loop.
constexpr double kSingleRecordPassMs = 100.0;

// The member `key` of a record, or null when it has none.
const json& Member(const json& record, const char* key) {
    static const json kNull;
    const auto it = record.find(key);
    return it != record.end() ? *it : kNull;
}

// A number of `value` that the field type T holds exactly; false for anything else. Whole numbers
// are read as integers, so that 64-bit timestamps keep every digit.
template <typename T>
bool ToField(const json& value, T* field) {
    if (!value.is_number()) return false;
    if (std::is_floating_point<T>::value) {
        *field = static_cast<T>(value.get<double>());
        return true;
    }
    if (value.is_number_unsigned()) {
        const uint64_t number = value.get<uint64_t>();
        if (number > static_cast<uint64_t>(std::numeric_limits<T>::max())) return false;
        *field = static_cast<T>(number);
        return true;
    }
    if (value.is_number_integer()) {
        const int64_t number = value.get<int64_t>();
        if (number < static_cast<int64_t>(std::numeric_limits<T>::lowest()) ||
            (number > 0 && static_cast<uint64_t>(number) >
                               static_cast<uint64_t>(std::numeric_limits<T>::max()))) {
            return false;
        }
        *field = static_cast<T>(number);
        return true;
    }
    // A float of the event that holds a whole number (a count, say, written as 12).
    const double number = value.get<double>();
    if (number != std::floor(number) ||
        number < static_cast<double>(std::numeric_limits<T>::lowest()) ||
        number > static_cast<double>(std::numeric_limits<T>::max())) {
        return false;
    }
    *field = static_cast<T>(number);
    return true;
}

// A float of the event: a number, or null for what JSON cannot hold (NaN).
bool ToFloat(const json& value, float* field) {
    if (value.is_null()) {
        *field = std::numeric_limits<float>::quiet_NaN();
        return true;
    }
    return ToField(value, field);
}

// The inverse of the range conversion: header values, then eleven per zone.
std::string RebuildRange(const json& record, MultiRangingData* data) {
    const json& values = Member(record, "data");
    if (!values.is_array() || values.size() < kRangeHeaderValues) {
        return "\"data\" needs the " + std::to_string(kRangeHeaderValues) + " header values";
    }
    uint8_t zones = 0;
    if (!ToField(values[8], &zones) || zones > kMaxRangingZones) {
        return "zone count (data[8]) is not 0.." + std::to_string(kMaxRangingZones);
    }
    if (values.size() != kRangeHeaderValues + zones * kRangeZoneValues) {
        return "\"data\" has " + std::to_string(values.size()) + " values; " +
               std::to_string(zones) + " zones need " +
               std::to_string(kRangeHeaderValues + zones * kRangeZoneValues);
    }
    bool ok = ToField(Member(record, "timestamp"), &data->time_ms) &&
              ToField(values[1], &data->stream_count) && ToField(values[2], &data->device_status) &&
              ToField(values[3], &data->frame_flags) && ToField(values[4], &data->range_state) &&
              ToField(values[5], &data->effective_rate) &&
              ToField(values[6], &data->temperature_c) && ToField(values[7], &data->error_flags) &&
              ToField(values[9], &data->frame_number);
    data->zone_count = zones;
    for (size_t i = 0; ok && i < zones; ++i) {
        const size_t base = kRangeHeaderValues + i * kRangeZoneValues;
        RangingZone& zone = data->zones[i];
        ok = ToField(values[base], &zone.target_status) &&
             ToField(values[base + 1], &zone.distance_mm) &&
             ToField(values[base + 2], &zone.sigma_mm) &&
             ToField(values[base + 3], &zone.signal_rate) &&
             ToField(values[base + 4], &zone.ambient_rate) &&
             ToField(values[base + 5], &zone.spad_count) &&
             ToField(values[base + 6], &zone.min_distance_mm) &&
             ToField(values[base + 7], &zone.target_count) &&
             ToField(values[base + 8], &zone.confidence) &&
             ToField(values[base + 9], &zone.reflectance) &&
             ToField(values[base + 10], &zone.flags);
    }
    if (!ok) return "a value does not fit its field of the range record";
    data->valid = 1;
    return "";
}

// The inverse of the light conversion: channels 3 and 4 come swapped in the event.
std::string RebuildLight(const json& record, ALSResult* result) {
    const json& values = Member(record, "data");
    if (!values.is_array() || values.size() != kLightChannels) {
        return "\"data\" needs the " + std::to_string(kLightChannels) + " channels";
    }
    const size_t order[kLightChannels] = {0, 1, 2, 4, 3};
    bool ok = ToField(Member(record, "status"), &result->status) &&
              ToField(Member(record, "timestamp"), &result->timestamp_ns) &&
              ToFloat(Member(record, "value0"), &result->color_temperature) &&
              ToFloat(Member(record, "value1"), &result->lux);
    for (size_t i = 0; ok && i < kLightChannels; ++i) {
        ok = ToFloat(values[i], &result->channels[order[i]]);
    }
    if (!ok) return "a value does not fit its field of the light record";
    result->valid = 1;
    return "";
}

}  // namespace

std::optional<Recording> Recording::Load(const std::string& path, Sensor sensor, bool loop,
                                         std::string* error) {
    std::ifstream file(path);
    if (!file) {
        *error = path + ": cannot be read";
        return std::nullopt;
    }
    const char* const name = sensor == Sensor::kRange ? "range" : "als";
    std::vector<Sample> samples;
    std::optional<int64_t> first_timestamp;
    std::string line;
    for (int number = 1; std::getline(file, line); ++number) {
        const auto fail = [&](const std::string& reason) {
            *error = path + ":" + std::to_string(number) + ": " + reason;
            return std::nullopt;
        };
        if (line.find_first_not_of(" \t\r") == std::string::npos) continue;
        const json record = json::parse(line, nullptr, false);
        if (record.is_discarded() || !record.is_object()) return fail("not a JSON object");
        if (Member(record, "sensor") != name) {
            return fail(std::string("not a record of the ") + name + " sensor");
        }
        int64_t timestamp = 0;
        if (!ToField(Member(record, "timestamp"), &timestamp)) {
            return fail("no whole \"timestamp\"");
        }
        const json& validity = Member(record, "valid");
        if (!validity.is_null() && !validity.is_boolean()) {
            return fail("\"valid\" is not true or false");
        }
        const bool valid = validity != false;
        Sample sample;
        std::string problem;
        if (valid) {
            problem = sensor == Sensor::kRange ? RebuildRange(record, &sample.range)
                                               : RebuildLight(record, &sample.light);
        } else if (sensor == Sensor::kRange) {
            sample.range.time_ms = static_cast<uint32_t>(timestamp);
        } else {
            sample.light.timestamp_ns = timestamp;
        }
        if (!problem.empty()) return fail(problem);
        if (!first_timestamp) first_timestamp = timestamp;
        const double relative = static_cast<double>(timestamp - *first_timestamp);
        // Range timestamps are milliseconds of the sensor's clock, light ones nanoseconds.
        sample.time_ms = sensor == Sensor::kRange ? relative : relative / 1e6;
        if (!samples.empty() && sample.time_ms < samples.back().time_ms) {
            return fail("\"timestamp\" goes back in time");
        }
        samples.push_back(sample);
    }
    if (samples.empty()) {
        *error = path + ": no records";
        return std::nullopt;
    }
    return Recording(std::move(samples), loop);
}

bool Recording::LoadReplay(const std::string& path, Sensor sensor, bool loop, const char* key,
                           const char* part, std::optional<Recording>* replay) {
    if (path.empty()) return true;
    std::string error;
    *replay = Load(path, sensor, loop, &error);
    if (!*replay) {
        __android_log_print(ANDROID_LOG_ERROR, kTag, "%s Create failed: %s %s", part, key,
                            error.c_str());
        return false;
    }
    __android_log_print(ANDROID_LOG_INFO, kTag, "simulated %s: replaying %zu records of %s%s", part,
                        (*replay)->size(), path.c_str(), loop ? " in a loop" : "");
    return true;
}

Recording::Recording(std::vector<Sample> samples, bool loop)
    : samples_(std::move(samples)), loop_(loop) {
    const double last = samples_.back().time_ms;
    pass_ms_ = samples_.size() > 1 ? last + last / static_cast<double>(samples_.size() - 1)
                                   : kSingleRecordPassMs;
    if (pass_ms_ <= 0) pass_ms_ = kSingleRecordPassMs;
}

double Recording::TimeOf(int64_t index) const {
    const int64_t count = static_cast<int64_t>(samples_.size());
    return static_cast<double>(index / count) * pass_ms_ + samples_[index % count].time_ms;
}

Recording::Pick Recording::Next(double elapsed_ms) {
    const int64_t count = static_cast<int64_t>(samples_.size());
    int64_t pass = 0;
    double within = elapsed_ms;
    if (loop_) {
        pass = static_cast<int64_t>(std::floor(std::max(elapsed_ms, 0.0) / pass_ms_));
        within = elapsed_ms - static_cast<double>(pass) * pass_ms_;
    }
    int64_t latest = 0;
    while (latest + 1 < count && samples_[latest + 1].time_ms <= within) ++latest;
    latest += pass * count;
    if (latest > taken_) {
        taken_ = latest;
        return {&samples_[latest % count], 0};
    }
    if (!loop_ && taken_ == count - 1) return {&samples_[count - 1], 0};
    return {nullptr, TimeOf(taken_ + 1)};
}

}  // namespace sensors_sim
