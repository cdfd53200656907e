// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "event_format.h"

#include <cmath>
#include <cstdio>
#include <cstdlib>

#include "options.h"

namespace vyrctl {

using aidl::android::vyr::Event;

AlsReading DecodeAls(const Event& event) {
    AlsReading reading;
    reading.lux = event.value1;
    reading.color_temperature = event.value0;
    reading.channels = event.data;
    return reading;
}

RangeFrame DecodeRange(const Event& event) {
    RangeFrame frame;
    const std::vector<float>& data = event.data;
    if (data.size() < kRangeHeaderFloats) return frame;
    frame.frame_number = data[kRangeFrameNumberIndex];
    frame.reported_zones = static_cast<int>(data[kRangeZoneCountIndex]);
    size_t available = (data.size() - kRangeHeaderFloats) / kRangeZoneFloats;
    size_t wanted = frame.reported_zones > 0 ? static_cast<size_t>(frame.reported_zones) : 0;
    size_t count = std::min(available, wanted);
    for (size_t i = 0; i < count; ++i) {
        size_t base = kRangeHeaderFloats + i * kRangeZoneFloats;
        frame.zones.push_back(
            {static_cast<int>(data[base + kZoneStatusOffset]), data[base + kZoneDistanceOffset]});
    }
    frame.complete =
        count == wanted && data.size() == kRangeHeaderFloats + wanted * kRangeZoneFloats;
    return frame;
}

std::string FormatFloat(float value) {
    if (std::isnan(value)) return "nan";
    if (std::isinf(value)) return value > 0 ? "inf" : "-inf";
    char buffer[32];
    for (int precision = 6; precision <= 9; ++precision) {
        snprintf(buffer, sizeof(buffer), "%.*g", precision, static_cast<double>(value));
        if (strtof(buffer, nullptr) == value) break;
    }
    return buffer;
}

namespace {

std::string FloatList(const std::vector<float>& values, const char* separator) {
    std::string text;
    for (size_t i = 0; i < values.size(); ++i) {
        if (i > 0) text += separator;
        text += FormatFloat(values[i]);
    }
    return text;
}

// JSON has no NaN or infinity; such values become null.
std::string JsonNumber(float value) {
    return std::isfinite(value) ? FormatFloat(value) : "null";
}

std::string JsonList(const std::vector<float>& values) {
    std::string text = "[";
    for (size_t i = 0; i < values.size(); ++i) {
        if (i > 0) text += ",";
        text += JsonNumber(values[i]);
    }
    return text + "]";
}

std::string StatusText(const Event& event) {
    return std::to_string(event.status);
}

}  // namespace

std::string FormatEventRaw(const Event& event) {
    return "status=" + StatusText(event) + " timestamp=" + std::to_string(event.timestamp) +
           " value0=" + FormatFloat(event.value0) + " value1=" + FormatFloat(event.value1) +
           " data=[" + FloatList(event.data, ",") + "]";
}

std::string FormatEventReadable(int32_t mode, const Event& event) {
    char buffer[160];
    if (mode == kModeAls) {
        AlsReading reading = DecodeAls(event);
        snprintf(buffer, sizeof(buffer), "als   t=%lld lux=%.1f colour_temp=%.0f status=%s ",
                 static_cast<long long>(event.timestamp), static_cast<double>(reading.lux),
                 static_cast<double>(reading.color_temperature), StatusText(event).c_str());
        return buffer + ("channels=[" + FloatList(reading.channels, " ") + "]");
    }
    if (mode == kModeRange) {
        RangeFrame frame = DecodeRange(event);
        snprintf(buffer, sizeof(buffer), "range t=%lld frame=%.0f zones=%d",
                 static_cast<long long>(event.timestamp), static_cast<double>(frame.frame_number),
                 frame.reported_zones);
        std::string line = buffer;
        for (size_t i = 0; i < frame.zones.size(); ++i) {
            snprintf(buffer, sizeof(buffer), " | z%zu %.0f mm st=%d", i,
                     static_cast<double>(frame.zones[i].distance_mm), frame.zones[i].target_status);
            line += buffer;
        }
        if (!frame.complete)
            line += " (incomplete data: " + std::to_string(event.data.size()) + " values)";
        return line;
    }
    return "mode " + std::to_string(mode) + " " + FormatEventRaw(event);
}

std::string FormatRingSampleReadable(int32_t mode, uint64_t seq, const Event& event,
                                     int64_t received_boottime_ns) {
    char tail[80];
    snprintf(tail, sizeof(tail), " seq=%llu age=%.3f ms", static_cast<unsigned long long>(seq),
             static_cast<double>(received_boottime_ns - event.boottime) / 1e6);
    return FormatEventReadable(mode, event) + tail;
}

std::string FormatEventJson(int32_t mode, int32_t handle, const Event& event,
                            int64_t received_boottime_ns) {
    std::string json =
        std::string("{\"format\":") + std::to_string(kRecordingFormat) + ",\"sensor\":\"" +
        ModeName(mode) + "\",\"handle\":" + std::to_string(handle) +
        ",\"status\":" + StatusText(event) + ",\"timestamp\":" + std::to_string(event.timestamp) +
        ",\"value0\":" + JsonNumber(event.value0) + ",\"value1\":" + JsonNumber(event.value1) +
        ",\"data\":" + JsonList(event.data);
    if (mode == kModeAls) {
        AlsReading reading = DecodeAls(event);
        json += ",\"lux\":" + JsonNumber(reading.lux) +
                ",\"color_temperature\":" + JsonNumber(reading.color_temperature) +
                ",\"channels\":" + JsonList(reading.channels);
    } else if (mode == kModeRange) {
        RangeFrame frame = DecodeRange(event);
        json += ",\"frame_number\":" + FormatFloat(frame.frame_number) +
                ",\"zone_count\":" + std::to_string(frame.reported_zones) + ",\"zones\":[";
        for (size_t i = 0; i < frame.zones.size(); ++i) {
            if (i > 0) json += ",";
            json += "{\"status\":" + std::to_string(frame.zones[i].target_status) +
                    ",\"distance_mm\":" + JsonNumber(frame.zones[i].distance_mm) + "}";
        }
        json += "]";
    }
    return json + ",\"boottime_ns\":" + std::to_string(event.boottime) +
           ",\"received_boottime_ns\":" + std::to_string(received_boottime_ns) + "}";
}

}  // namespace vyrctl
