// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Decoding and printing of Event records. The service flattens each sensor record into
// Event::data; these helpers give the values their names back.

#include <aidl/android/vyr/Event.h>

#include <cstdint>
#include <string>
#include <vector>

namespace vyrctl {

struct AlsReading {
    float lux = 0;                // Event::value1
    float color_temperature = 0;  // Event::value0
    std::vector<float> channels;  // Event::data, in the order delivered
};

struct RangeZone {
    int target_status = 0;
    float distance_mm = 0;
};

struct RangeFrame {
    float frame_number = 0;
    int reported_zones = 0;
    std::vector<RangeZone> zones;
    // False when data is shorter than its header or its zone count claims.
    bool complete = false;
};

// Layout of a range event's data: a fixed header, then one record per zone.
constexpr size_t kRangeHeaderFloats = 10;
constexpr size_t kRangeZoneFloats = 11;
constexpr size_t kRangeZoneCountIndex = 8;
constexpr size_t kRangeFrameNumberIndex = 9;
constexpr size_t kZoneStatusOffset = 0;
constexpr size_t kZoneDistanceOffset = 1;

// The version of the JSON lines that `stream --json` prints, a recording's format: raised when a
// field changes meaning or goes, never when one is added.
constexpr int kRecordingFormat = 1;

AlsReading DecodeAls(const aidl::android::vyr::Event& event);
RangeFrame DecodeRange(const aidl::android::vyr::Event& event);

// Shortest text that reads back as the same float.
std::string FormatFloat(float value);
// "status=S timestamp=T value0=V value1=V data=[a,b,...]": every field, nothing interpreted.
std::string FormatEventRaw(const aidl::android::vyr::Event& event);
// One human-readable line with the decoded values of the given mode.
std::string FormatEventReadable(int32_t mode, const aidl::android::vyr::Event& event);
// The line of `vyrctl ring`: FormatEventReadable, then the sample's seq in the ring and its age
// when it was read (received_boottime_ns less the reading's boot time), in milliseconds.
std::string FormatRingSampleReadable(int32_t mode, uint64_t seq,
                                     const aidl::android::vyr::Event& event,
                                     int64_t received_boottime_ns);
// One JSON object (no newline) with the raw fields and the decoded values, then the reading's
// boot time ("boottime_ns") and the boot time at which OnEvent (or the poll) returned it
// ("received_boottime_ns"): the sample's age when the client got it is their difference.
std::string FormatEventJson(int32_t mode, int32_t handle, const aidl::android::vyr::Event& event,
                            int64_t received_boottime_ns);

}  // namespace vyrctl
