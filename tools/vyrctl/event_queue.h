// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Hands events from binder threads (callbacks) to the command's main thread, which alone prints
// and counts them and watches for stop requests.

#include <aidl/android/vyr/Event.h>

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <mutex>
#include <optional>

namespace vyrctl {

// An event with the boot time at which OnEvent ran, in nanoseconds.
struct ReceivedEvent {
    aidl::android::vyr::Event event;
    int64_t received_boottime_ns = 0;
};

class EventQueue {
  public:
    void Push(ReceivedEvent event);
    // The oldest event, or nothing after `timeout`.
    std::optional<ReceivedEvent> Pop(std::chrono::milliseconds timeout);

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<ReceivedEvent> events_;
};

}  // namespace vyrctl
