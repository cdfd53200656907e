// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// One record of a sample ring as a reader copies it out of the shared memory
// (vyr/sample_ring_reader.h): a plain value, whole and consistent, that the service's later
// writes can no longer change.

#include <aidl/android/vyr/Event.h>
#include <vyr/sample_ring_layout.h>

#include <array>
#include <cstdint>

namespace vyr {

struct RingSample {
    // The sample's place in the ring's sequence, from 1 (vyr/sample_ring_layout.h).
    uint64_t seq = 0;
    // When the sensor library returned the reading, CLOCK_BOOTTIME nanoseconds (Event.boottime).
    int64_t boottime_ns = 0;
    // The sensor's own time value (Event.timestamp).
    int64_t timestamp = 0;
    int32_t status = 0;
    float value0 = 0;
    float value1 = 0;
    // Event.data: the first data_count values are the reading's, the rest are zero.
    std::array<float, VYR_RING_DATA_CAPACITY> data{};
    uint32_t data_count = 0;

    // The same reading as the binder interface hands it over (OnEvent, PollOnce).
    aidl::android::vyr::Event ToEvent() const;
};

}  // namespace vyr
