// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "client_entry.h"

#include <utility>

namespace android {
namespace vyr {
namespace binder {

ClientEntry::~ClientEntry() {
    // The notification thread uses this entry; it must be gone before the members are.
    Disable();
}

void ClientEntry::StopNotify() {
    state = kClientDisabled;
    if (delivery.sample_queue) delivery.sample_queue->Stop();
    if (notify_cv) {
        // Taking the mutex once orders the state change before any wait that has not yet begun,
        // so the notification cannot fall between the thread's test of `state` and its wait.
        { std::lock_guard<std::mutex> lock(*notify_mutex); }
        notify_cv->notify_all();
    }
}

void ClientEntry::Disable() {
    StopNotify();
    if (notify_thread && notify_thread->joinable()) {
        if (notify_thread->get_id() == std::this_thread::get_id()) {
            notify_thread->detach();
        } else {
            notify_thread->join();
        }
    }
    notify_thread.reset();
    notify_cv.reset();
    notify_mutex.reset();
    delivery.sample_queue.reset();
}

std::unique_ptr<std::thread> ClientEntry::StopAndHandOver() {
    StopNotify();
    std::unique_ptr<std::thread> thread = std::move(notify_thread);
    notify_cv.reset();
    notify_mutex.reset();
    delivery.sample_queue.reset();
    return thread;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
