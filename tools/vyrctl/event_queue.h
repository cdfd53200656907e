// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Hands events from binder threads (callbacks) to the command's main thread, which alone prints
// and counts them and watches for stop requests.

#include <aidl/android/vyr/Event.h>

#include <chrono>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <optional>

namespace vyrctl {

class EventQueue {
  public:
    void Push(const aidl::android::vyr::Event& event);
    // The oldest event, or nothing after `timeout`.
    std::optional<aidl::android::vyr::Event> Pop(std::chrono::milliseconds timeout);

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<aidl::android::vyr::Event> events_;
};

}  // namespace vyrctl
