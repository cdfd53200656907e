// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The real vyrservice binary on the simulated sensors, in a private temporary directory: its own
// binder registry, a property file with both sensors on, the simulators' state file and its log.

#include <aidl/android/vyr/IVYRService.h>

#include <chrono>
#include <map>
#include <memory>
#include <string>

#include "child_process.h"

namespace vyr_test {

class ServiceProcess {
  public:
    ServiceProcess();
    // Stops the service if it still runs and removes the directory.
    ~ServiceProcess();

    // Starts the binary and points this process's binder client at the same registry.
    bool Start(const std::string& binary);
    // Waits until "vyrservice" is registered; null on time-out or if the process ended.
    std::shared_ptr<aidl::android::vyr::IVYRService> WaitForService(
        std::chrono::milliseconds timeout);
    // SIGTERM, then SIGKILL if it has not ended within five seconds.
    void Stop();
    bool Running();
    pid_t pid() const { return process_ ? process_->pid() : -1; }
    // Resident memory of the service, in KiB; -1 when it cannot be read.
    long RssKib() const;

    // The environment a client process needs to reach this service.
    std::map<std::string, std::string> ClientEnvironment() const;
    std::string dir() const { return dir_; }
    // The simulators' state file as key/value pairs (empty while it does not exist).
    std::map<std::string, std::string> SensorState() const;
    // Waits until the state file has `key` equal to `value`.
    bool WaitForSensorState(const std::string& key, const std::string& value,
                            std::chrono::milliseconds timeout) const;
    // The service's log (its stderr) so far.
    std::string Log() const;
    bool WaitForLog(const std::string& text, std::chrono::milliseconds timeout) const;
    // How many times `text` occurs in the log.
    size_t LogCount(const std::string& text) const;

  private:
    std::string dir_;
    std::unique_ptr<ChildProcess> process_;
};

}  // namespace vyr_test
