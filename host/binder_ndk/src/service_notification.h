// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/unique_fd.h>
#include <android/binder_manager.h>

#include <atomic>
#include <string>
#include <thread>

// One registration for notices of a name: a thread that watches the registry directory with
// inotify (each registration renames an entry into it) and reports each new binder that the name
// resolves to.
struct AServiceManager_NotificationRegistration {
  public:
    AServiceManager_NotificationRegistration(std::string name, AServiceManager_onRegister callback,
                                             void* cookie);
    ~AServiceManager_NotificationRegistration();
    AServiceManager_NotificationRegistration(const AServiceManager_NotificationRegistration&) =
        delete;
    AServiceManager_NotificationRegistration& operator=(
        const AServiceManager_NotificationRegistration&) = delete;

    // False when the directory cannot be watched; nothing is started then.
    bool Start();
    // Stops and frees the registration; from its own notice, the thread frees it on return.
    void Delete();

  private:
    void Run();

    const std::string name_;
    const AServiceManager_onRegister callback_;
    void* const cookie_;
    android::base::unique_fd inotify_fd_;
    android::base::unique_fd wake_fd_;
    std::thread thread_;
    // Set by a Delete from the registration's own notice.
    std::atomic<bool> delete_on_return_{false};
};
