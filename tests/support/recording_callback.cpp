// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "recording_callback.h"

#include <android/binder_status.h>

namespace vyr_test {

template <typename Reaction, typename... Args>
void RecordingCallback::React(const Reaction& reaction, Args... args) {
    if (!reaction) return;
    reaction(args...);
    {
        std::lock_guard<std::mutex> lock(mutex_);
        --reacting_;
    }
    changed_.notify_all();
}

ndk::ScopedAStatus RecordingCallback::OnEvent(const aidl::android::vyr::Event& event) {
    std::function<void(size_t)> reaction;
    size_t count;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        events_.push_back(event);
        count = events_.size();
        reaction = reaction_;
        if (reaction) ++reacting_;
    }
    changed_.notify_all();
    React(reaction, count);
    if (failing_.load()) return ndk::ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR);
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus RecordingCallback::OnEventBatch(
    const std::vector<aidl::android::vyr::Event>& events) {
    std::function<void()> reaction;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        events_.insert(events_.end(), events.begin(), events.end());
        batch_sizes_.push_back(events.size());
        reaction = batch_reaction_;
        if (reaction) ++reacting_;
    }
    changed_.notify_all();
    React(reaction);
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus RecordingCallback::OnFlushComplete(int32_t) {
    std::function<void()> reaction;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        flushes_.push_back(events_.size());
        reaction = flush_reaction_;
        if (reaction) ++reacting_;
    }
    changed_.notify_all();
    React(reaction);
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

void RecordingCallback::SetBatchReaction(std::function<void()> reaction) {
    std::lock_guard<std::mutex> lock(mutex_);
    batch_reaction_ = std::move(reaction);
}

void RecordingCallback::SetFlushReaction(std::function<void()> reaction) {
    std::lock_guard<std::mutex> lock(mutex_);
    flush_reaction_ = std::move(reaction);
}

bool RecordingCallback::StopReacting(std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    reaction_ = nullptr;
    batch_reaction_ = nullptr;
    flush_reaction_ = nullptr;
    return changed_.wait_for(lock, timeout, [&] { return reacting_ == 0; });
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
