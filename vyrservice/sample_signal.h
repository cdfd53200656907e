// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <optional>

namespace android {
namespace vyr {
namespace binder {

// Wakes the delivery thread of one client enabled on sample: the processing loop publishes each
// stored sample to it, Flush asks it to hand over what it holds, and the client's disable stops
// it. Counters rather than flags, so that the thread can tell how many samples went by.
class SampleSignal {
  public:
    struct Seen {
        uint64_t samples = 0;
        uint64_t flushes = 0;
        bool stopped = false;
    };

    void Publish() EXCLUDES(mutex_);
    void Flush() EXCLUDES(mutex_);
    void Stop() EXCLUDES(mutex_);
    // Returns once the counters differ from `seen`, the signal is stopped, or the steady clock
    // has reached `deadline` when one is given.
    Seen Wait(const Seen& seen, std::optional<std::chrono::steady_clock::time_point> deadline)
        EXCLUDES(mutex_);

  private:
    bool ChangedLocked(const Seen& seen) const REQUIRES(mutex_);

    std::mutex mutex_;
    std::condition_variable changed_;
    Seen now_ GUARDED_BY(mutex_);
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
