#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <mutex>

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
struct WorkQueue {
    std::deque<WorkItem> items;
    std::mutex mutex;
    std::condition_variable cv;
    // For the dump: the longest the queue has been (under `mutex`), and the items the worker has
    // applied.
    size_t highest_depth = 0;
    std::atomic<uint64_t> applied{0};

    void PushAndSignal(const WorkItem& item);
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
