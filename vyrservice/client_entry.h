// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/IEventCallback.h>
#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>
#include <sys/types.h>

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <thread>
#include <utility>

#include "client_process_watcher.h"
#include "sample_queue.h"

namespace android {
namespace vyr {
namespace binder {

class VYRService;

// Identifies the callback binder and the service to the death notification.
using DeathCookie = std::pair<AIBinder*, VYRService*>;

// A client's `state`.
constexpr int32_t kClientDisabled = 0;
constexpr int32_t kClientEnabled = 1;

// One open client of the service. Its fields are guarded by the service's API lock, except the
// atomics and what the notification thread owns while it runs; no annotation here can name a lock
// that lives in the service.
struct ClientEntry {
    explicit ClientEntry(int32_t client_mode) : mode(client_mode) {}
    ~ClientEntry();
    ClientEntry(const ClientEntry&) = delete;
    ClientEntry& operator=(const ClientEntry&) = delete;

    // Marks the client disabled and stops its notification thread, waking it out of its sleep.
    // Called on that thread itself (a nested call from the client's OnEvent), it lets the thread
    // go instead of joining it: the thread ends when OnEvent returns, holding the entry until then.
    void Disable();
    // Marks the client disabled and wakes its notification thread without waiting for it to end:
    // for a caller that holds a lock which that thread may be waiting for (through a nested call
    // from OnEvent). The thread, its condition variable and mutex stay until Disable().
    void StopNotify();
    // Marks the client disabled, wakes its thread and hands that thread over to be joined once the
    // API lock is released (a client enabled on sample, whose callback may call back, be slow or
    // never answer). The entry is at once ready for a new enable; the thread keeps what it uses.
    std::unique_ptr<std::thread> StopAndHandOver();
    // Stopped by StopNotify, and its thread not yet joined.
    bool AwaitsJoin() const { return state == kClientDisabled && notify_thread != nullptr; }

    // The record of a client as the service has always kept it.
    const int32_t mode;
    int32_t period = 0;
    std::shared_ptr<aidl::android::vyr::IEventCallback> callback;
    // kClientEnabled or kClientDisabled; the notification thread polls it without a lock.
    std::atomic<int32_t> state{kClientDisabled};
    std::unique_ptr<std::thread> notify_thread;
    std::unique_ptr<std::condition_variable> notify_cv;
    std::unique_ptr<std::mutex> notify_mutex;
    // Held strongly: an in-process callback keeps only a weak reference to its own binder.
    ndk::SpAIBinder callback_binder;
    AIBinder_DeathRecipient* death_recipient = nullptr;
    // Owned by the service, which keeps every cookie for as long as a link made with it can
    // fire, also after this entry is gone.
    const DeathCookie* death_cookie = nullptr;

    // What the project adds to that record, one sub-record per concern.

    // How events reach the client beyond version 1's timer loop.
    struct Delivery {
        // Raised by each enable; a delivery thread runs only while it matches the value it was
        // started with, so one let go by a nested Disable ends although a nested enable followed.
        std::atomic<uint64_t> generation{0};
        // Set by EnableOnSample (version 2): delivery on each stored sample instead of a timer,
        // and the longest that samples may be held to be handed over together (0: none are held).
        bool on_sample = false;
        int32_t max_report_latency = 0;
        // The callback's interface version, asked by the first EnableOnSample after SetCallback
        // (0: not asked yet); only a callback known to be of version 2 gets version 2's methods.
        int32_t callback_version = 0;
        // The samples on their way to the thread of a client enabled on sample with a callback;
        // null otherwise.
        std::shared_ptr<SampleQueue> sample_queue;
        // Set by EnableRing (version 3): counted among its mode's ring clients until Disable,
        // Close or its death.
        bool ring = false;
    };
    Delivery delivery;

    // The processes that use the handle: the opener and every caller of a method on it since,
    // by the watcher's id (a pid alone may name a later process). Without a linked callback the
    // handle goes when the last of them has ended.
    struct Users {
        // The process that opened the handle, when it is not the service's own (for the dump).
        pid_t opener_pid = 0;
        std::map<ClientProcessWatcher::ProcessId, pid_t> processes;
        // A caller that could not be watched (the service's own process, or a failed pidfd): its
        // end cannot be known, so the handle is never released for the end of the others.
        bool unwatched = false;
    };
    Users users;

    // What only the dump reads.
    struct Counters {
        // Events handed to the callback, and polls answered with no new sample.
        std::atomic<uint64_t> events_delivered{0};
        std::atomic<uint64_t> polls_refused{0};
        // Samples that a client enabled on sample lost on the way (its queues count them, also
        // after the client's thread was stopped).
        const std::shared_ptr<std::atomic<uint64_t>> samples_dropped =
            std::make_shared<std::atomic<uint64_t>>(0);
    };
    Counters counters;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
