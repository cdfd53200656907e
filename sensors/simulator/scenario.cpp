// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensors_sim/scenario.h"

#include <android-base/strings.h>
#include <android/log.h>

#include <cerrno>
#include <cstdlib>
#include <fstream>
#include <optional>

#include "ubk/range_sensor.h"

namespace sensors_sim {
namespace {

constexpr char kTag[] = "sensors_sim";

std::optional<long long> ParseInteger(const std::string& text, long long min, long long max) {
    if (text.empty()) return std::nullopt;
    errno = 0;
    char* end = nullptr;
    const long long value = strtoll(text.c_str(), &end, 0);
    if (errno != 0 || *end != '\0' || value < min || value > max) return std::nullopt;
    return value;
}

std::optional<uint64_t> ParseSeed(const std::string& text) {
    if (text.empty() || text[0] == '-') return std::nullopt;
    errno = 0;
    char* end = nullptr;
    const unsigned long long value = strtoull(text.c_str(), &end, 0);
    if (errno != 0 || *end != '\0') return std::nullopt;
    return value;
}

std::optional<bool> ParseFlag(const std::string& text) {
    if (text == "1" || text == "true" || text == "yes" || text == "on") return true;
    if (text == "0" || text == "false" || text == "no" || text == "off") return false;
    return std::nullopt;
}

// `path` as seen from the folder of the scenario file `scenario_path`.
std::string NextTo(const std::string& scenario_path, const std::string& path) {
    if (path.empty() || path[0] == '/') return path;
    const size_t slash = scenario_path.rfind('/');
    return slash == std::string::npos ? path : scenario_path.substr(0, slash + 1) + path;
}

// Applies one setting; false when the key is unknown or the value unusable.
bool Apply(const std::string& key, const std::string& value, const std::string& path,
           Scenario* scenario) {
    if (key == "range.replay" || key == "als.replay") {
        if (value.empty()) return false;
        (key == "range.replay" ? scenario->range_replay : scenario->als_replay) =
            NextTo(path, value);
        return true;
    }
    if (key == "range.replay.loop" || key == "als.replay.loop") {
        const std::optional<bool> flag = ParseFlag(value);
        if (!flag) return false;
        (key == "range.replay.loop" ? scenario->range_replay_loop : scenario->als_replay_loop) =
            *flag;
        return true;
    }
    if (key == "als.create_fails" || key == "range.create_fails" || key == "range.init_fails") {
        const std::optional<bool> flag = ParseFlag(value);
        if (!flag) return false;
        if (key == "als.create_fails") scenario->als_create_fails = *flag;
        if (key == "range.create_fails") scenario->range_create_fails = *flag;
        if (key == "range.init_fails") scenario->range_init_fails = *flag;
        return true;
    }
    if (key == "invalid_every") {
        const auto n = ParseInteger(value, 0, 1000000);
        if (!n) return false;
        scenario->invalid_every = static_cast<int>(*n);
        return true;
    }
    if (key == "extra_latency_ms") {
        const auto n = ParseInteger(value, 0, 60000);
        if (!n) return false;
        scenario->extra_latency_ms = static_cast<int>(*n);
        return true;
    }
    if (key == "zone_count") {
        const auto n = ParseInteger(value, 0, kMaxRangingZones);
        if (!n) return false;
        scenario->zone_count = static_cast<int>(*n);
        return true;
    }
    if (key == "seed") {
        const auto n = ParseSeed(value);
        if (!n) return false;
        scenario->seed = *n;
        return true;
    }
    return false;
}

}  // namespace

Scenario ParseScenarioFile(const std::string& path) {
    Scenario scenario;
    std::ifstream file(path);
    if (!file) {
        __android_log_print(ANDROID_LOG_WARN, kTag, "cannot read scenario file %s, using defaults",
                            path.c_str());
        return scenario;
    }
    std::string line;
    int number = 0;
    while (std::getline(file, line)) {
        ++number;
        const std::string trimmed = android::base::Trim(line);
        if (trimmed.empty() || trimmed[0] == '#') continue;
        const size_t equals = trimmed.find('=');
        const std::string key = android::base::Trim(trimmed.substr(0, equals));
        const std::string value =
            equals == std::string::npos ? "" : android::base::Trim(trimmed.substr(equals + 1));
        if (equals == std::string::npos || !Apply(key, value, path, &scenario)) {
            __android_log_print(ANDROID_LOG_WARN, kTag, "%s:%d: ignoring \"%s\"", path.c_str(),
                                number, trimmed.c_str());
        }
    }
    return scenario;
}

Scenario LoadScenario() {
    const char* path = getenv(kScenarioVariable);
    if (path == nullptr || *path == '\0') return Scenario{};
    return ParseScenarioFile(path);
}

}  // namespace sensors_sim
