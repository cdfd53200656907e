// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

void WorkQueue::PushAndSignal(const WorkItem& item) {
    std::lock_guard<std::mutex> lock(mutex_);
    items_.push_back(item);
    if (items_.size() > highest_depth_) highest_depth_ = items_.size();
    cv_.notify_all();
}

std::optional<WorkItem> WorkQueue::WaitAndPop(const std::atomic<bool>& running) {
    std::unique_lock<std::mutex> lock(mutex_);
    base::ScopedLockAssertion locked(mutex_);
    cv_.wait(lock, [&]() REQUIRES(mutex_) { return !items_.empty() || !running; });
    if (!running) return std::nullopt;
    WorkItem item = items_.front();
    items_.pop_front();
    return item;
}

void WorkQueue::WakeAll() {
    // Under the mutex, so that the wake-up cannot fall between the worker's test and its wait.
    std::lock_guard<std::mutex> lock(mutex_);
    cv_.notify_all();
}

size_t WorkQueue::Depth() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return items_.size();
}

size_t WorkQueue::HighestDepth() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return highest_depth_;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
