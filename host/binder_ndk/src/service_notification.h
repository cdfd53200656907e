// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>
#include <android-base/unique_fd.h>
#include <android/binder_auto_utils.h>
#include <android/binder_manager.h>

#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

// One registration for notices of a name. A watcher thread follows the registry directory with
// inotify (each registration renames an entry into it) and queues a notice per registration;
// the notices run on pool threads, one at a time and in order, as a device delivers them (a
// oneway call from servicemanager to one callback object).
struct AServiceManager_NotificationRegistration;

namespace vyr_binder {

// A registration whose notices run on its watcher thread, pool or not; null on failure.
AServiceManager_NotificationRegistration* RegisterForNoticesWithoutPool(
    const char* instance, AServiceManager_onRegister callback, void* cookie);

}  // namespace vyr_binder

struct AServiceManager_NotificationRegistration {
  public:
    // With `on_pool` false the notices run on the watcher thread itself: the runtime's own
    // waits for a name use that, as they need no pool on a device either.
    AServiceManager_NotificationRegistration(const char* instance,
                                             AServiceManager_onRegister callback, void* cookie,
                                             bool on_pool);
    ~AServiceManager_NotificationRegistration();
    AServiceManager_NotificationRegistration(const AServiceManager_NotificationRegistration&) =
        delete;
    AServiceManager_NotificationRegistration& operator=(
        const AServiceManager_NotificationRegistration&) = delete;

    // False when the directory cannot be watched; nothing is started then.
    bool Start();

  private:
    // What the queued notices share with the registration, which may be deleted before they
    // run.
    struct Notices {
        const char* instance;  // the caller's string, handed back as a device does
        // Held while a notice runs, as a device holds the registration's lock: deleting the
        // registration waits for a notice that is running.
        std::mutex mutex;
        AServiceManager_onRegister callback GUARDED_BY(mutex);
        void* cookie GUARDED_BY(mutex);
        std::mutex queue_mutex;
        std::deque<ndk::SpAIBinder> queue GUARDED_BY(queue_mutex);
        bool draining GUARDED_BY(queue_mutex) = false;

        // Runs the queued notices; on a pool thread.
        void Drain();
    };

    void Run();
    // Queues a notice of `binder`, and the work that delivers it if none is queued.
    void Notify(ndk::SpAIBinder binder);

    const std::string name_;
    const bool on_pool_;
    const std::shared_ptr<Notices> notices_;
    android::base::unique_fd inotify_fd_;
    android::base::unique_fd wake_fd_;
    std::thread thread_;
};
