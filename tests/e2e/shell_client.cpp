// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "shell_client.h"

#include <thread>

namespace vyr_test::e2e {
namespace {

using namespace std::chrono_literals;

// vyrctl waits this long for the service to register before it gives up.
constexpr char kConnectTimeoutSeconds[] = "20";
constexpr auto kResultTimeout = 25s;
constexpr auto kExitGrace = 10s;

}  // namespace

ShellClient::ShellClient(const std::map<std::string, std::string>& env,
                         const std::string& stderr_path)
    // Given time to end on end of input, as a user's shell would.
    : process_(std::make_unique<vyr_test::ChildProcess>(
          std::vector<std::string>{VYRCTL_PATH, "--timeout", kConnectTimeoutSeconds, "shell"}, env,
          stderr_path, kExitGrace)) {}

std::optional<int64_t> ShellClient::Call(const std::string& command) {
    if (!process_->WriteLine(command)) return std::nullopt;
    while (true) {
        const std::optional<std::string> line = process_->ReadLine(kResultTimeout);
        if (!line) return std::nullopt;
        // Pushed events are printed as "event ..." lines between results.
        if (line->rfind(command + " -> ", 0) != 0) continue;
        try {
            return std::stoll(line->substr(command.size() + 4));
        } catch (const std::exception&) {
            // "ok" for commands without a result code.
            return 0;
        }
    }
}

bool ShellClient::CallUntil(const std::string& command, int64_t expected,
                            std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (Call(command) != expected) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(50ms);
    }
    return true;
}

}  // namespace vyr_test::e2e
