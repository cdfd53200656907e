// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <sys/types.h>

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <map>
#include <mutex>
#include <set>
#include <string>
#include <thread>

namespace vyr_test::display {

// A one-file FUSE file system served by a thread of this process: its file behaves like a sysfs
// attribute (poll() reports POLLPRI|POLLERR once after each change) but holds any content the
// test sets and can fail reads with any error, which no kernel attribute does on demand.
// Mounted in this process's private mount namespace; needs root and /dev/fuse.
class FuseAttribute {
  public:
    FuseAttribute();
    ~FuseAttribute();
    FuseAttribute(const FuseAttribute&) = delete;
    FuseAttribute& operator=(const FuseAttribute&) = delete;

    // Empty when mounted, else why not.
    const std::string& problem() const { return problem_; }
    const std::string& path() const { return file_path_; }

    // Replaces the content and notifies pollers.
    void Set(const std::string& content);
    // Later reads fail with `error` (an errno value), or succeed again with 0; no notification.
    void FailReads(int error);
    // Notifies pollers without changing anything.
    void Notify();

    size_t opens();
    size_t reads();
    // Waits until `count` read requests were answered; false on time-out.
    bool WaitForReads(size_t count, std::chrono::milliseconds timeout);
    bool WaitForOpens(size_t count, std::chrono::milliseconds timeout);

  private:
    void Serve();
    void Handle(const char* request);
    void Reply(uint64_t unique, int error, const void* payload, size_t size);

    std::string problem_;
    std::string mount_dir_;
    std::string file_path_;
    int fuse_fd_ = -1;
    int stop_fd_ = -1;
    std::thread server_;

    std::mutex mutex_;
    std::condition_variable served_;
    std::string content_;
    int read_error_ = 0;
    uint64_t generation_ = 0;
    uint64_t next_handle_ = 1;
    // The generation that each open file last reported to a poller.
    std::map<uint64_t, uint64_t> seen_;
    std::set<uint64_t> poll_handles_;
    size_t opens_ = 0;
    size_t reads_ = 0;
};

}  // namespace vyr_test::display
