// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Command-line parsing of vyrctl: numbers are checked strictly, so a typo is an error, not a zero.

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace vyrctl {

// Sensor modes as the service numbers them.
constexpr int32_t kModeAls = 1;
constexpr int32_t kModeRange = 3;

// A whole decimal (or 0x hexadecimal) number that fits in 32 bits, nothing else.
std::optional<int32_t> ParseInt32(const std::string& text);
// A finite, non-negative number of seconds.
std::optional<double> ParseSeconds(const std::string& text);
// "als", "light", "range" or a mode number.
std::optional<int32_t> ParseMode(const std::string& text);
const char* ModeName(int32_t mode);

struct GlobalOptions {
    double timeout_s = 15.0;
    std::string command;
    std::vector<std::string> args;
};

struct StreamOptions {
    int32_t mode = kModeRange;
    int32_t period_ms = 100;
    bool use_callback = false;
    std::optional<int64_t> count;
    std::optional<double> seconds;
    bool low_power = false;
    bool json = false;
    // Re-attach when the service restarts; false: end with an error.
    bool reconnect = true;
    // The newest interface version to use (--interface 1: the timer of version 1).
    int32_t interface_version = 2;
    // How much longer than needed each callback takes, as a slow client's would (0: none).
    int32_t callback_delay_ms = 0;
};

// `vyrctl ring`: one handle enabled with EnableRing, its samples read from the ring.
struct RingOptions {
    int32_t mode = kModeRange;
    int32_t period_ms = 100;
    // Read this long, then stop; unset: until Ctrl-C or SIGTERM.
    std::optional<double> seconds;
    bool json = false;
};

struct DemoViewOptions {
    double seconds = 15.0;
    std::optional<double> torch_at_s;
    int32_t period_ms = 200;
};

// Each parser returns false and fills `error` with a one-line reason on bad input.
bool ParseGlobalOptions(const std::vector<std::string>& argv, GlobalOptions* options,
                        std::string* error);
bool ParseStreamOptions(const std::vector<std::string>& args, StreamOptions* options,
                        std::string* error);
bool ParseRingOptions(const std::vector<std::string>& args, RingOptions* options,
                      std::string* error);
bool ParseDemoViewOptions(const std::vector<std::string>& args, DemoViewOptions* options,
                          std::string* error);

std::string UsageText();

}  // namespace vyrctl
