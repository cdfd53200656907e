// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>
#include <android/binder_auto_utils.h>
#include <android/binder_status.h>

#include <atomic>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "looper.h"

namespace vyr_binder {

class Connection;
class Listener;

// Everything the runtime keeps per process. Made on first use and never destroyed, so runtime
// threads still running at exit never see it torn down; VyrBinder_shutdown empties it instead.
class ProcessState {
  public:
    static ProcessState& Get();

    Looper& looper() { return looper_; }
    // Names this process to its peers: "p<pid>-<random>".
    std::string key();

    binder_exception_t Publish(const std::string& name, const ndk::SpAIBinder& binder);
    ndk::SpAIBinder FindLocalService(const std::string& name);
    // The named service: this process's own object, a proxy to another process's, or null.
    ndk::SpAIBinder Lookup(const std::string& name);

    // A connection a peer made to us.
    void Adopt(const std::shared_ptr<Connection>& connection);
    // Records the key a peer introduced itself with, so lookups reuse its connection.
    void NamePeer(const std::shared_ptr<Connection>& connection, const std::string& key);
    void Shutdown();

  private:
    ProcessState() = default;
    std::shared_ptr<Connection> ConnectTo(const std::string& dir, const std::string& key);
    bool EnsureListenerLocked(const std::string& dir) REQUIRES(mutex_);
    // The open connection to `peer_key`, if there is one that is not dead.
    std::shared_ptr<Connection> LiveConnectionLocked(const std::string& peer_key) REQUIRES(mutex_);
    static void RemoveFilesAtExit();

    Looper looper_;

    std::mutex services_mutex_;
    std::map<std::string, ndk::SpAIBinder> services_ GUARDED_BY(services_mutex_);

    std::mutex mutex_;
    std::string key_ GUARDED_BY(mutex_);
    bool shutting_down_ GUARDED_BY(mutex_) = false;
    std::map<std::string, std::weak_ptr<Connection>> by_key_ GUARDED_BY(mutex_);
    // By registry directory.
    std::map<std::string, std::unique_ptr<Listener>> listeners_ GUARDED_BY(mutex_);
    // (directory, name)
    std::vector<std::pair<std::string, std::string>> published_ GUARDED_BY(mutex_);
    // Once this process publishes a name, any peer may call it, over any connection.
    std::atomic<bool> may_be_called_{false};
};

}  // namespace vyr_binder
