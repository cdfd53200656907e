// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "event_conversion.h"

#include <algorithm>

namespace android {
namespace vyr {
namespace binder {

using aidl::android::vyr::Event;

void ConvertAlsResult(const ALSResult& result, Event* event) {
    event->status = static_cast<uint8_t>(result.status);
    event->timestamp = result.timestamp_ns;
    event->value0 = result.color_temperature;
    event->value1 = result.lux;
    // Clients index the channels in this order; the last two are swapped on purpose.
    event->data = {result.channels[0], result.channels[1], result.channels[2], result.channels[4],
                   result.channels[3]};
}

void ConvertRangingData(const MultiRangingData& data, Event* event) {
    event->status = 0;
    event->timestamp = static_cast<int64_t>(data.time_ms);
    event->value0 = 0;
    event->value1 = 0;
    std::vector<float>& out = event->data;
    out.clear();
    out.push_back(static_cast<float>(data.time_ms));
    out.push_back(static_cast<float>(data.stream_count));
    out.push_back(static_cast<float>(data.device_status));
    out.push_back(static_cast<float>(data.frame_flags));
    out.push_back(static_cast<float>(data.range_state));
    out.push_back(static_cast<float>(data.effective_rate));
    out.push_back(static_cast<float>(data.temperature_c));
    out.push_back(static_cast<float>(data.error_flags));
    out.push_back(static_cast<float>(data.zone_count));
    out.push_back(static_cast<float>(data.frame_number));
    // A count beyond the record's zone array would read past the record.
    const int zones = std::min<int>(data.zone_count, kMaxRangingZones);
    for (int i = 0; i < zones; ++i) {
        const RangingZone& zone = data.zones[i];
        out.push_back(static_cast<float>(zone.target_status));
        out.push_back(static_cast<float>(zone.distance_mm));
        out.push_back(static_cast<float>(zone.sigma_mm));
        out.push_back(static_cast<float>(zone.signal_rate));
        out.push_back(static_cast<float>(zone.ambient_rate));
        out.push_back(static_cast<float>(zone.spad_count));
        out.push_back(static_cast<float>(zone.min_distance_mm));
        out.push_back(static_cast<float>(zone.target_count));
        out.push_back(static_cast<float>(zone.confidence));
        out.push_back(static_cast<float>(zone.reflectance));
        out.push_back(static_cast<float>(zone.flags));
    }
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
