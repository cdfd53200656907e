// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "ring_feed.h"

#include <aidl/android/vyr/Event.h>
#include <android-base/thread_annotations.h>

#include "event_conversion.h"
#include "sensor_modes.h"

namespace android {
namespace vyr {
namespace binder {

void FeedRing(ServiceModeParams& params) {
    // Held by the caller; GCC cannot parse an annotation that names an argument's member.
    android::base::ScopedLockAssertion held(params.data_mutex);
    SampleRing* ring = params.feed.ring.get();
    if (ring == nullptr || params.feed.ring_clients == 0) return;
    aidl::android::vyr::Event event;
    if (params.mode == kRangeMode) {
        if (params.range_data.valid == 0) return;
        ConvertRangingData(params.range_data, &event);
    } else {
        if (params.als_data.valid == 0) return;
        ConvertAlsResult(params.als_data, &event);
    }
    event.boottime = params.feed.boottime_ns;
    ring->Write(event);
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
