// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <mutex>
#include <optional>

namespace android {
namespace vyr {
namespace binder {

// One request for a worker to switch a sensor mode on or off on behalf of a handle.
struct WorkItem {
    bool enable = false;
    int32_t mode = 0;
    int32_t handle = 0;
    // Requested sampling period in milliseconds; 0 in disable items.
    int32_t period = 0;
};

// The unbounded FIFO between the producers (binder threads, display monitor) and one worker.
class WorkQueue {
  public:
    void PushAndSignal(const WorkItem& item) EXCLUDES(mutex_);
    // Waits until there is an item or `running` is false; the front item, or nothing once
    // `running` is false (what is queued then stays).
    std::optional<WorkItem> WaitAndPop(const std::atomic<bool>& running) EXCLUDES(mutex_);
    // Wakes the worker so that it sees `running` false.
    void WakeAll() EXCLUDES(mutex_);
    // Counts an item the worker has applied.
    void CountApplied() { applied_.fetch_add(1, std::memory_order_relaxed); }

    // For the dump.
    size_t Depth() const EXCLUDES(mutex_);
    size_t HighestDepth() const EXCLUDES(mutex_);
    uint64_t Applied() const { return applied_.load(std::memory_order_relaxed); }

  private:
    std::deque<WorkItem> items_ GUARDED_BY(mutex_);
    mutable std::mutex mutex_;
    std::condition_variable cv_;
    size_t highest_depth_ GUARDED_BY(mutex_) = 0;
    std::atomic<uint64_t> applied_{0};
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
