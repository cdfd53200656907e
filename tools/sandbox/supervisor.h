// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <sys/types.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace vyr_sandbox {

// Exit statuses of the sandbox itself (the command's own status is forwarded otherwise).
inline constexpr int kExitNoPrivilege = 77;
inline constexpr int kExitSetupFailed = 125;
inline constexpr int kExitExecFailed = 127;

struct SandboxOptions {
    std::string panel;          // initial content of the backlight state attribute
    std::string apex_dir;       // host directory shown as /apex
    std::string property_file;  // exported as VYR_PROPERTY_FILE when not empty
    bool read_stdin = true;     // control commands come from stdin; its end ends the command
    bool restart = false;       // start the command again after each exit, as init does
    std::vector<std::string> command;
};

// Runs one command in private mount and UTS namespaces and relays control commands from stdin
// until the command ends (with `restart`, until it is asked to stop); the command's last exit
// status becomes the sandbox's.
class Supervisor {
  public:
    explicit Supervisor(SandboxOptions options)
        : options_(std::move(options)), stdin_open_(options_.read_stdin) {}

    int Run();

  private:
    // What ended a wait.
    enum class Wake { kCommandEnded, kStop, kTimeout };

    pid_t StartCommand();
    // Handles one control line; false when the caller asked to end the command.
    bool HandleLine(const std::string& line);
    // Relays control lines until the command ends (its status in `status`), a stop is asked for
    // (signal, quit, end of stdin) or `deadline` passes.
    Wake Wait(int signal_fd, std::optional<std::chrono::steady_clock::time_point> deadline,
              int* status);
    int Terminate(int signal_fd);

    SandboxOptions options_;
    pid_t child_ = -1;
    bool stdin_open_;
    std::string pending_;
};

// Sets the backlight state of the sandbox that contains process `pid`.
int SetPanelOf(pid_t pid, const std::string& state);

}  // namespace vyr_sandbox
