#pragma once

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <set>
#include <thread>
#include <unordered_map>

#include "ambient_light_sensor.h"
#include "ubk/range_sensor.h"

namespace android {
namespace vyr {
namespace binder {

// The sampling state of one sensor mode. The worker of the mode's sensor type changes it under
// its sensor lock; the processing loop reads `mode` and `active_period` once a cycle without
// that lock, hence the atomics.
struct ServiceModeParams {
    std::atomic<bool> running{false};
    // Handle to the sampling period it asked for, in milliseconds.
    std::unordered_map<int32_t, int32_t> periods;
    std::atomic<int32_t> active_period{1000};
    std::atomic<int32_t> mode{0};
    int32_t enable_count = 0;
    std::thread process_thread;
    std::condition_variable wait_cv;
    std::mutex wait_mutex;
    MultiRangingData range_data{};
    ALSResult als_data{};
    // Handles that have taken the current sample.
    std::set<int32_t> polled_handles;
    std::mutex data_mutex;
    // For the dump, written by the processing loop: samples stored, those marked invalid, and
    // when the last one was stored (steady clock, 0 before the first).
    std::atomic<uint64_t> samples{0};
    std::atomic<uint64_t> invalid_samples{0};
    std::atomic<int64_t> last_sample_ns{0};
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
