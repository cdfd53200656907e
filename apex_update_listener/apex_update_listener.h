// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <thread>

// Watches the APEX info list for changes to the records of one package and reports each change
// to a callback on a thread of its own.
class ApexUpdateListener {
  public:
    // One "apex-info" entry of the list.
    struct Info {
        std::string module_name;
        std::string module_path;
        std::string preinstalled_module_path;
        int64_t version_code = 0;
        std::string version_name;
        bool is_factory = false;
        bool is_active = false;

        // Orders by state first (a factory-only record before an active one), then version, then
        // paths and name.
        bool operator<(const Info& other) const;
    };

    // Called with the records seen before and after a change.
    using Callback = std::function<void(const std::set<Info>&, const std::set<Info>&)>;

    // Pass key: only Make builds listeners.
    class Sigil {
      private:
        // explicit keeps the type from being an aggregate, so `{}` cannot stand in for a key.
        explicit Sigil() = default;
        friend class ApexUpdateListener;
        // Tests feed the thread event records through a socket in place of the inotify instance.
        friend class ApexUpdateListenerTestPeer;
    };

    ApexUpdateListener(Sigil, const std::string& package, const std::string& path, Callback callback,
                       int inotify_fd, int watch_descriptor, const std::set<Info>& initial_info);
    virtual ~ApexUpdateListener();

    ApexUpdateListener(const ApexUpdateListener&) = delete;
    ApexUpdateListener& operator=(const ApexUpdateListener&) = delete;

    // Watches `path` for changes to the records of `package`. Returns null (and logs why) on
    // failure. With `invoke_with_initial_version` the callback first sees an empty old set and
    // the current records, on the caller's thread, before this returns.
    static std::unique_ptr<ApexUpdateListener> Make(const std::string& package, Callback callback,
                                                    bool invoke_with_initial_version,
                                                    const std::string& path);

    // Reads the records of `package` from the info list at `path`; no value (logged) when the
    // file cannot be parsed or holds none.
    static std::optional<std::set<Info>> TrySlurpInfo(const std::string& package,
                                                      const std::string& path);

    // What the listener watches and last read, for a diagnostic dump; safe from any thread.
    struct Status {
        std::string package;
        std::string path;
        std::set<Info> records;
        uint64_t reloads = 0;
    };
    Status GetStatus() const;
    // Called on the listener thread after each re-read with its outcome: "unchanged",
    // "changed" or "unreadable".
    void SetReloadObserver(std::function<void(const std::string&)> observer);

  private:
    void ThreadFunction();
    // Logs one event and re-reads the list when the event calls for it.
    void HandleEvent(uint32_t mask);
    // Compares the list's records with current_info_ and reports a difference.
    void CheckForUpdate();
    // Counts a re-read and tells the observer its outcome.
    void NoteReload(const std::string& outcome);

    const std::string package_name_;
    const std::string info_list_path_;
    Callback callback_;
    std::atomic<bool> running_;
    int32_t inotify_fd_;
    int32_t watch_descriptor_;
    // Written only by the listener thread, which alone also reads it without the lock.
    std::set<Info> current_info_;
    mutable std::mutex status_mutex_;
    uint64_t reloads_ GUARDED_BY(status_mutex_) = 0;
    std::function<void(const std::string&)> reload_observer_ GUARDED_BY(status_mutex_);
    // Last: the thread starts in the constructor and uses every member above.
    std::thread thread_;
};
