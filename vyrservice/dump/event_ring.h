// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <chrono>
#include <cstddef>
#include <deque>
#include <mutex>
#include <string>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

// The last few things that happened to the service (opens, closes, enables, deaths, display
// changes, APEX reloads), with the monotonic time of each, for the dump.
class EventRing {
  public:
    static constexpr size_t kCapacity = 64;

    struct Entry {
        std::chrono::steady_clock::time_point time;
        std::string text;
    };

    void Record(std::string text) EXCLUDES(mutex_);
    // Oldest first.
    std::vector<Entry> Snapshot() const EXCLUDES(mutex_);

  private:
    mutable std::mutex mutex_;
    std::deque<Entry> entries_ GUARDED_BY(mutex_);
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
