// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#define LOG_TAG "vyrservice"

#include "sample_queue.h"

#include <log/log.h>

#include <algorithm>
#include <utility>

namespace android {
namespace vyr {
namespace binder {

namespace {

size_t CapacityFor(int32_t period_ms) {
    const size_t one_second = period_ms >= 1 ? static_cast<size_t>(1000 / period_ms) : 1000;
    return std::max(SampleQueue::kMinCapacity, one_second);
}

}  // namespace

SampleQueue::SampleQueue(int32_t handle, int32_t period_ms,
                         std::shared_ptr<std::atomic<uint64_t>> dropped)
    : handle_(handle),
      period_ms_(period_ms),
      capacity_(CapacityFor(period_ms)),
      dropped_(std::move(dropped)),
      queued_at_(std::chrono::steady_clock::now()) {}

bool SampleQueue::DueLocked(int32_t active_period_ms,
                            std::chrono::steady_clock::time_point stored_at) {
    const int64_t active = std::max(active_period_ms, 1);
    if (last_active_ms_ != 0 && active != last_active_ms_) {
        const int64_t since_queued =
            std::chrono::duration_cast<std::chrono::milliseconds>(stored_at - queued_at_).count();
        span_ms_ = std::max(span_ms_ + active, since_queued);
    } else {
        span_ms_ += active;
    }
    last_active_ms_ = static_cast<int32_t>(active);
    // span > period - active / 2, in whole milliseconds.
    return 2 * span_ms_ + active > 2 * int64_t{period_ms_};
}

bool SampleQueue::Offer(const QueuedSample& sample, int32_t active_period_ms,
                        std::chrono::steady_clock::time_point stored_at) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (stopped_ || !DueLocked(active_period_ms, stored_at)) return false;
        span_ms_ = 0;
        last_active_ms_ = std::max(active_period_ms, 1);
        queued_at_ = stored_at;
        if (samples_.size() >= capacity_) {
            samples_.pop_front();
            ++*dropped_;
            if (!dropping_) {
                dropping_ = true;
                ALOGW("handle %d is slower than its samples: the oldest of %zu queued are dropped",
                      handle_, capacity_);
            }
        }
        samples_.push_back(sample);
    }
    changed_.notify_all();
    return true;
}

void SampleQueue::Flush() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        ++flushes_;
    }
    changed_.notify_all();
}

void SampleQueue::Stop() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        stopped_ = true;
    }
    changed_.notify_all();
}

SampleQueue::Taken SampleQueue::Take(std::optional<std::chrono::steady_clock::time_point> deadline) {
    std::unique_lock<std::mutex> lock(mutex_);
    // The analysis cannot follow unique_lock.
    android::base::ScopedLockAssertion locked(mutex_);
    const auto ready = [this]() REQUIRES(mutex_) {
        return stopped_ || flushes_ != 0 || !samples_.empty();
    };
    while (!ready()) {
        if (!deadline) {
            changed_.wait(lock);
        } else if (changed_.wait_until(lock, *deadline) == std::cv_status::timeout) {
            break;
        }
    }
    Taken taken;
    taken.samples.swap(samples_);
    taken.flushes = std::exchange(flushes_, 0);
    taken.stopped = stopped_;
    dropping_ = false;
    return taken;
}

void SampleQueue::CountDropped(uint64_t samples) {
    *dropped_ += samples;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
