// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "event_queue.h"

namespace vyrctl {

void EventQueue::Push(ReceivedEvent event) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        events_.push_back(std::move(event));
    }
    changed_.notify_all();
}

std::optional<ReceivedEvent> EventQueue::Pop(std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    if (!changed_.wait_for(lock, timeout, [this] { return !events_.empty(); })) {
        return std::nullopt;
    }
    ReceivedEvent event = std::move(events_.front());
    events_.pop_front();
    return event;
}

}  // namespace vyrctl
