// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <memory>
#include <string>
#include <thread>

namespace vyr_binder {

// This process's socket in one registry directory, and the thread that accepts peers on it.
class Listener {
  public:
    // Null (with a log line) when the socket cannot be made.
    static std::unique_ptr<Listener> Create(const std::string& dir, const std::string& key);
    ~Listener();
    Listener(const Listener&) = delete;
    Listener& operator=(const Listener&) = delete;

    const std::string& dir() const { return dir_; }
    // Stops accepting and removes the socket and lock files.
    void Stop();

  private:
    Listener(std::string dir, std::string key, int socket_fd, int lock_fd);
    void AcceptLoop();

    const std::string dir_;
    const std::string key_;
    const int socket_fd_;
    const int lock_fd_;
    std::thread thread_;
    bool stopped_ = false;
};

}  // namespace vyr_binder
