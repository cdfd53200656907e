// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>

#include "ambient_light_sensor.h"
#include "ubk/range_sensor.h"

namespace android {
namespace vyr {
namespace binder {

// One stored sample as the processing loop had it: the record of the mode's library and when
// that library returned it (CLOCK_BOOTTIME nanoseconds).
struct QueuedSample {
    MultiRangingData range{};
    ALSResult als{};
    int64_t boottime_ns = 0;
};

// The samples on their way to one client enabled on sample: the processing loop queues every k-th
// sample as it stores it, the client's delivery thread takes them, Flush asks that thread to hand
// over what it holds, and the client's disable stops it.
//
// The queue holds one second of the client's samples (at least kMinCapacity records). A client
// slower than its samples for longer loses the oldest ones: they are counted, and a warning is
// logged once for each run of drops (until the thread has taken what is queued).
class SampleQueue {
  public:
    static constexpr size_t kMinCapacity = 16;

    // `dropped` counts what this client loses, for the dump; it outlives the queue.
    SampleQueue(int32_t handle, int32_t period_ms, std::shared_ptr<std::atomic<uint64_t>> dropped);

    // By the processing loop, with the mode block's data_mutex held, as it stores a valid sample
    // taken while the mode samples every `active_period_ms`: queues it when it is due. A sample
    // is due when the samples since the last one queued span the client's period to within half
    // an active period (k = round(period / active period) while that stays the same). When the
    // active period changes, the span so far is reckoned as the time since the last queued sample,
    // if that is longer, so that the next interval is the client's period to within one active
    // period. True if queued.
    bool Offer(const QueuedSample& sample, int32_t active_period_ms,
               std::chrono::steady_clock::time_point stored_at) EXCLUDES(mutex_);
    void Flush() EXCLUDES(mutex_);
    void Stop() EXCLUDES(mutex_);

    struct Taken {
        std::deque<QueuedSample> samples;
        // Flushes asked for since the last Take; every sample queued before them is in `samples`.
        uint64_t flushes = 0;
        bool stopped = false;
    };
    // Waits until samples or a flush are queued, the queue is stopped, or the steady clock has
    // reached `deadline` when one is given; takes what is queued.
    Taken Take(std::optional<std::chrono::steady_clock::time_point> deadline) EXCLUDES(mutex_);

    // Samples that this client loses on the way (the delivery thread's too).
    void CountDropped(uint64_t samples);
    int32_t handle() const { return handle_; }
    size_t capacity() const { return capacity_; }

  private:
    bool DueLocked(int32_t active_period_ms, std::chrono::steady_clock::time_point stored_at)
        REQUIRES(mutex_);

    const int32_t handle_;
    const int32_t period_ms_;
    const size_t capacity_;
    const std::shared_ptr<std::atomic<uint64_t>> dropped_;
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<QueuedSample> samples_ GUARDED_BY(mutex_);
    uint64_t flushes_ GUARDED_BY(mutex_) = 0;
    bool stopped_ GUARDED_BY(mutex_) = false;
    // In a run of drops: warned already.
    bool dropping_ GUARDED_BY(mutex_) = false;
    // The stride: milliseconds of sampling since the last queued sample (or since the enable,
    // before the first), the active period of the last sample offered, and when the last sample
    // was queued (or the queue made).
    int64_t span_ms_ GUARDED_BY(mutex_) = 0;
    int32_t last_active_ms_ GUARDED_BY(mutex_) = 0;
    std::chrono::steady_clock::time_point queued_at_ GUARDED_BY(mutex_);
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
