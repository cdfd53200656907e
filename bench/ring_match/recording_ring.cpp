// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "recording_ring.h"

#include <algorithm>
#include <cmath>
#include <fstream>
#include <limits>
#include <nlohmann/json.hpp>
#include <random>

#include "sample_ring.h"

namespace vyr_bench {
namespace {

using aidl::android::vyr::Event;
using nlohmann::json;

constexpr int32_t kRangeMode = 3;

// The member `key` of a line, or null when it has none.
const json& Member(const json& line, const char* key) {
    static const json kNull;
    const auto it = line.find(key);
    return it != line.end() ? *it : kNull;
}

// A float of the event: a number, or null for what JSON cannot hold (NaN).
bool ToFloat(const json& value, float* field) {
    if (value.is_null()) {
        *field = std::numeric_limits<float>::quiet_NaN();
        return true;
    }
    if (!value.is_number()) return false;
    *field = value.get<float>();
    return true;
}

// Whole numbers are read as integers, so that 64-bit times keep every digit.
bool ToInt64(const json& value, int64_t* field) {
    if (!value.is_number_integer()) return false;
    *field = value.get<int64_t>();
    return true;
}

// The event of a recorded sample with the fields that the service writes into a ring; an empty
// reason, or why the line is no such sample.
std::string ToEvent(const json& line, Event* event) {
    int64_t status = 0;
    if (!ToInt64(Member(line, "status"), &status) ||
        !ToInt64(Member(line, "timestamp"), &event->timestamp) ||
        !ToFloat(Member(line, "value0"), &event->value0) ||
        !ToFloat(Member(line, "value1"), &event->value1)) {
        return "no status, timestamp, value0 and value1";
    }
    event->status = static_cast<int32_t>(status);
    const json& data = Member(line, "data");
    if (!data.is_array()) return "no \"data\"";
    event->data.resize(data.size());
    for (size_t i = 0; i < data.size(); ++i) {
        if (!ToFloat(data[i], &event->data[i])) return "a value of \"data\" is no number";
    }
    // A recording of interface version 1 has none (or 0): nothing to match a frame against.
    if (!ToInt64(Member(line, "boottime_ns"), &event->boottime) || event->boottime <= 0) {
        return "no \"boottime_ns\"";
    }
    return "";
}

// NaN, which a recording may hold, is the same NaN after the ring.
bool SameFloat(float a, float b) {
    return a == b || (std::isnan(a) && std::isnan(b));
}

uint64_t Distance(int64_t a, int64_t b) {
    return a > b ? static_cast<uint64_t>(a) - static_cast<uint64_t>(b)
                 : static_cast<uint64_t>(b) - static_cast<uint64_t>(a);
}

}  // namespace

std::unique_ptr<RecordingRing> RecordingRing::Load(const std::string& path, std::string* error) {
    std::ifstream file(path);
    if (!file) {
        *error = path + ": cannot be read";
        return nullptr;
    }
    std::vector<Event> samples;
    std::string text;
    for (int number = 1; std::getline(file, text); ++number) {
        const auto fail = [&](const std::string& reason) {
            *error = path + ":" + std::to_string(number) + ": " + reason;
            return nullptr;
        };
        if (text.find_first_not_of(" \t\r") == std::string::npos) continue;
        const json line = json::parse(text, nullptr, false);
        if (line.is_discarded() || !line.is_object()) return fail("not a JSON object");
        // The service writes only valid samples into a ring.
        if (Member(line, "valid") == false) continue;
        Event event;
        const std::string problem = ToEvent(line, &event);
        if (!problem.empty()) return fail(problem);
        // Around's binary search, and so Nearest, rely on the ring's order.
        if (!samples.empty() && event.boottime < samples.back().boottime) {
            return fail("\"boottime_ns\" goes back in time");
        }
        samples.push_back(std::move(event));
    }
    if (samples.empty()) {
        *error = path + ": no samples";
        return nullptr;
    }
    // A ring keeps its newest VYR_RING_CAPACITY samples.
    if (samples.size() > VYR_RING_CAPACITY) {
        samples.erase(samples.begin(), samples.end() - VYR_RING_CAPACITY);
    }

    std::unique_ptr<android::vyr::binder::SampleRing> ring =
        android::vyr::binder::SampleRing::Create(kRangeMode, VYR_RING_CAPACITY, error);
    if (ring == nullptr) return nullptr;
    for (Event& sample : samples) {
        ring->Write(sample);
        // As the reader copies it back: data cut to a record's capacity.
        if (sample.data.size() > VYR_RING_DATA_CAPACITY) sample.data.resize(VYR_RING_DATA_CAPACITY);
    }
    // The mapping keeps the memory once the writer is gone.
    std::unique_ptr<vyr::SampleRingReader> reader =
        vyr::SampleRingReader::Map(ring->ReaderFd(), error);
    if (reader == nullptr) return nullptr;
    return std::unique_ptr<RecordingRing>(new RecordingRing(std::move(samples), std::move(reader)));
}

std::vector<int64_t> RecordingRing::LookupTimes(size_t count, uint64_t seed) const {
    const int64_t first = samples_.front().boottime;
    const int64_t last = samples_.back().boottime;
    const int64_t margin = (last - first) / 10;
    const uint64_t width = static_cast<uint64_t>(last - first + 2 * margin) + 1;
    // The generator's raw numbers, not a distribution of the standard library, whose numbers
    // differ between implementations: the same seed gives the same times everywhere.
    std::mt19937_64 generator(seed);
    std::vector<int64_t> times(count);
    for (int64_t& time : times) time = first - margin + static_cast<int64_t>(generator() % width);
    return times;
}

bool RecordingRing::NearestIsRight(int64_t boottime_ns, const vyr::RingSample& answer) const {
    size_t nearest = 0;
    // In order, and only a nearer one replaces it: the earlier of two as near stays.
    for (size_t i = 1; i < samples_.size(); ++i) {
        if (Distance(samples_[i].boottime, boottime_ns) <
            Distance(samples_[nearest].boottime, boottime_ns)) {
            nearest = i;
        }
    }
    // Samples of one boot time are all as near: the answer may be any of them.
    return IsRecorded(answer) && answer.boottime_ns == samples_[nearest].boottime;
}

bool RecordingRing::AroundIsRight(int64_t boottime_ns,
                                  const vyr::SampleRingReader::Bracket& bracket) const {
    // The number of samples at or before the time: the seq of the last of them, and the index
    // of the first after it.
    size_t at_or_before = 0;
    while (at_or_before < samples_.size() && samples_[at_or_before].boottime <= boottime_ns) {
        ++at_or_before;
    }
    const bool before_right =
        at_or_before == 0
            ? !bracket.before
            : bracket.before && bracket.before->seq == at_or_before && IsRecorded(*bracket.before);
    const bool after_right =
        at_or_before == samples_.size()
            ? !bracket.after
            : bracket.after && bracket.after->seq == at_or_before + 1 && IsRecorded(*bracket.after);
    return before_right && after_right;
}

bool RecordingRing::IsRecorded(const vyr::RingSample& answer) const {
    if (answer.seq < 1 || answer.seq > samples_.size()) return false;
    const Event& sample = samples_[answer.seq - 1];
    const Event got = answer.ToEvent();
    return got.boottime == sample.boottime && got.timestamp == sample.timestamp &&
           got.status == sample.status && SameFloat(got.value0, sample.value0) &&
           SameFloat(got.value1, sample.value1) &&
           std::equal(got.data.begin(), got.data.end(), sample.data.begin(), sample.data.end(),
                      SameFloat);
}

}  // namespace vyr_bench
