// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <sys/types.h>

#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "child_process.h"
#include "service_log.h"

namespace vyr_test::e2e {

// The real vyrservice binary in vyr-sandbox, in a fresh temporary directory of its own that holds
// the binder registry, the property file, the APEX info list, the simulator's state file and
// the service's log.
class SandboxedService {
  public:
    struct Options {
        std::string panel = "Off";
        std::map<std::string, std::string> properties;
        std::string apex_list;
        // The sandbox starts the service again after each exit, as init does.
        bool restart = false;
    };

    explicit SandboxedService(const Options& options);
    ~SandboxedService();

    // Empty when the sandbox runs the service, else why not.
    const std::string& problem() const { return problem_; }
    std::chrono::steady_clock::time_point started_at() const { return started_at_; }
    pid_t service_pid() const { return service_pid_; }
    // Environment entries that let a client reach this service.
    std::map<std::string, std::string> ClientEnvironment() const;
    const std::string& dir() const { return dir_; }

    bool Panel(const std::string& state);
    // Waits until the display monitor's last read of the state attribute returned `length`
    // bytes: the position of the service's descriptor on the attribute.
    bool WaitForMonitorRead(size_t length, std::chrono::milliseconds timeout) const;
    bool MonitorWatching() const;

    // Rewrites the APEX info list in place with one write() at offset 0: one IN_MODIFY.
    bool WriteApexList(const std::string& content) const;

    std::vector<LogLine> Log() const;
    bool WaitForLog(const std::string& tag, char priority, const std::string& message,
                    std::chrono::milliseconds timeout, size_t count = 1) const;
    // The simulators' state file as key/value pairs.
    std::map<std::string, std::string> SensorState() const;
    bool WaitForSensorState(const std::string& key, const std::string& value,
                            std::chrono::milliseconds timeout) const;

    // The service's exit status as the sandbox forwards it (code, or 128 + signal).
    std::optional<int> WaitForExit(std::chrono::milliseconds timeout);
    // With `restart`: the pid of the next start, after the exit has been read.
    std::optional<pid_t> WaitForRestart(std::chrono::milliseconds timeout);

  private:
    std::string dir_;
    std::string problem_;
    std::unique_ptr<vyr_test::ChildProcess> sandbox_;
    pid_t service_pid_ = -1;
    std::chrono::steady_clock::time_point started_at_;
    std::optional<int> exit_status_;
};

}  // namespace vyr_test::e2e
