// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "child_process.h"

namespace vyr_test::e2e {

// A `vyrctl shell` client process: one command line in, one "<command> -> <result>" line out.
class ShellClient {
  public:
    ShellClient(const std::map<std::string, std::string>& env, const std::string& stderr_path);

    // The leading number of the command's result, or nothing when no result line came.
    std::optional<int64_t> Call(const std::string& command);
    // Repeats `command` until its result is `expected`; false on time-out.
    bool CallUntil(const std::string& command, int64_t expected, std::chrono::milliseconds timeout);
    vyr_test::ChildProcess& process() { return *process_; }

  private:
    std::unique_ptr<vyr_test::ChildProcess> process_;
};

}  // namespace vyr_test::e2e
