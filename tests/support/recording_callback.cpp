// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "recording_callback.h"

#include <android/binder_status.h>

namespace vyr_test {

ndk::ScopedAStatus RecordingCallback::OnEvent(const aidl::android::vyr::Event& event) {
    std::function<void(size_t)> reaction;
    size_t count;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        events_.push_back(event);
        count = events_.size();
        reaction = reaction_;
    }
    changed_.notify_all();
    if (reaction) reaction(count);
    if (failing_.load()) return ndk::ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR);
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus RecordingCallback::OnEventBatch(
    const std::vector<aidl::android::vyr::Event>& events) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        events_.insert(events_.end(), events.begin(), events.end());
        batch_sizes_.push_back(events.size());
    }
    changed_.notify_all();
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus RecordingCallback::OnFlushComplete(int32_t) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        flushes_.push_back(events_.size());
    }
    changed_.notify_all();
    return ndk::ScopedAStatus::ok();
}

std::vector<size_t> RecordingCallback::BatchSizes() {
    std::lock_guard<std::mutex> lock(mutex_);
    return batch_sizes_;
}

bool RecordingCallback::WaitForBatches(size_t count, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, timeout, [&] { return batch_sizes_.size() >= count; });
}

std::vector<size_t> RecordingCallback::Flushes() {
    std::lock_guard<std::mutex> lock(mutex_);
    return flushes_;
}

bool RecordingCallback::WaitForFlushes(size_t count, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, timeout, [&] { return flushes_.size() >= count; });
}

void RecordingCallback::SetReaction(std::function<void(size_t count)> reaction) {
    std::lock_guard<std::mutex> lock(mutex_);
    reaction_ = std::move(reaction);
}

std::vector<aidl::android::vyr::Event> RecordingCallback::Events() {
    std::lock_guard<std::mutex> lock(mutex_);
    return events_;
}

size_t RecordingCallback::Count() {
    std::lock_guard<std::mutex> lock(mutex_);
    return events_.size();
}

bool RecordingCallback::WaitForEvents(size_t count, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, timeout, [&] { return events_.size() >= count; });
}

}  // namespace vyr_test
