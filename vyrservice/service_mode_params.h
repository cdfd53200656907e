// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <set>
#include <thread>
#include <unordered_map>
#include <vector>

#include "ambient_light_sensor.h"
#include "sample_queue.h"
#include "sample_ring.h"
#include "ubk/range_sensor.h"

namespace android {
namespace vyr {
namespace binder {

// The sampling state of one sensor mode. The worker of the mode's sensor type changes it under
// its sensor lock; the processing loop reads `mode` and `active_period` once a cycle without
// that lock, hence the atomics. `periods` and `enable_count` are guarded by that sensor lock,
// which the service owns (one per worker, not per block), so no annotation here can name it.
struct ServiceModeParams {
    // The block as the service has always kept it.
    std::atomic<bool> running{false};
    // Handle to the sampling period it asked for, in milliseconds.
    std::unordered_map<int32_t, int32_t> periods;
    std::atomic<int32_t> active_period{1000};
    std::atomic<int32_t> mode{0};
    int32_t enable_count = 0;
    std::thread process_thread;
    std::condition_variable wait_cv;
    std::mutex wait_mutex;
    MultiRangingData range_data GUARDED_BY(data_mutex){};
    ALSResult als_data GUARDED_BY(data_mutex){};
    // Handles that have taken the current sample.
    std::set<int32_t> polled_handles GUARDED_BY(data_mutex);
    std::mutex data_mutex;

    // What the project adds to that block, one sub-record per concern.

    // What version 2's delivery on sample takes from each stored sample.
    struct SampleFeed {
        // When the sensor library returned the stored sample, CLOCK_BOOTTIME nanoseconds.
        int64_t boottime_ns = 0;
        // The queues of the clients enabled on sample with a callback, offered each sample as it
        // is stored.
        std::vector<std::shared_ptr<SampleQueue>> sample_queues;
        // Version 3: the mode's sample ring, made by the first EnableRing and kept, so that every
        // client's mapping stays the same memory; written while `ring_clients` are enabled on it.
        std::shared_ptr<SampleRing> ring;
        int32_t ring_clients = 0;
    };
    SampleFeed feed GUARDED_BY(data_mutex);

    // What only the dump reads. The processing loop counts the samples stored, those marked
    // invalid, and when the last one was stored (steady clock, 0 before the first). The worker
    // copies `enable_count` and `periods` after each item: the dump never waits for a worker that
    // may be joining a sampling thread.
    struct DumpState {
        std::atomic<uint64_t> samples{0};
        std::atomic<uint64_t> invalid_samples{0};
        std::atomic<int64_t> last_sample_ns{0};
        std::mutex mutex;
        int32_t enable_count GUARDED_BY(mutex) = 0;
        std::unordered_map<int32_t, int32_t> periods GUARDED_BY(mutex);
    };
    DumpState dump;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
