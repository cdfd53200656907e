// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// A child process started with posix_spawn (safe in a process that already runs binder
// threads), with its stdin and stdout as pipes to the test and its stderr to a file.

#include <sys/types.h>

#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace vyr_test {

class ChildProcess {
  public:
    // Starts `argv` with the test's environment plus `env`; stderr goes to `stderr_path`.
    // `exit_grace` is how long the destructor lets the child end by itself once its stdin is
    // closed before it kills it.
    ChildProcess(const std::vector<std::string>& argv,
                 const std::map<std::string, std::string>& env, const std::string& stderr_path,
                 std::chrono::milliseconds exit_grace = std::chrono::milliseconds(0));
    // Closes stdin, then kills (SIGKILL) and reaps the child if it still runs after the grace.
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    bool started() const { return pid_ > 0; }
    pid_t pid() const { return pid_; }

    bool WriteLine(const std::string& line);
    void CloseStdin();
    // The next whole line of stdout; nothing at end of output or after `timeout`.
    std::optional<std::string> ReadLine(std::chrono::milliseconds timeout);
    // Reads lines until one starts with `prefix`; the skipped lines are appended to `skipped`.
    std::optional<std::string> ReadLineStartingWith(const std::string& prefix,
                                                    std::chrono::milliseconds timeout,
                                                    std::vector<std::string>* skipped = nullptr);

    void Signal(int signal);
    // Waits for the child to end; its wait status, or nothing after `timeout`.
    std::optional<int> Wait(std::chrono::milliseconds timeout);
    bool Running();

  private:
    std::chrono::milliseconds exit_grace_;
    pid_t pid_ = -1;
    int stdin_fd_ = -1;
    int stdout_fd_ = -1;
    std::string pending_;
    std::optional<int> status_;
};

// A process that only sleeps (a minute), to be watched and killed.
std::unique_ptr<ChildProcess> StartSleeper(const std::string& stderr_path);

}  // namespace vyr_test
