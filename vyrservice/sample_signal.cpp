// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sample_signal.h"

namespace android {
namespace vyr {
namespace binder {

void SampleSignal::Publish() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        ++now_.samples;
    }
    changed_.notify_all();
}

void SampleSignal::Flush() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        ++now_.flushes;
    }
    changed_.notify_all();
}

void SampleSignal::Stop() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        now_.stopped = true;
    }
    changed_.notify_all();
}

bool SampleSignal::ChangedLocked(const Seen& seen) const {
    return now_.stopped || now_.samples != seen.samples || now_.flushes != seen.flushes;
}

SampleSignal::Seen SampleSignal::Wait(const Seen& seen,
                                      std::optional<std::chrono::steady_clock::time_point> deadline) {
    std::unique_lock<std::mutex> lock(mutex_);
    // The analysis cannot follow unique_lock.
    android::base::ScopedLockAssertion locked(mutex_);
    while (!ChangedLocked(seen)) {
        if (!deadline) {
            changed_.wait(lock);
        } else if (changed_.wait_until(lock, *deadline) == std::cv_status::timeout) {
            break;
        }
    }
    return now_;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
