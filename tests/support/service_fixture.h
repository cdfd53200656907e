// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// What the in-process fixtures of the service (service, data path, display) share: the log tag
// and properties, how long to wait, the service's configuration on the sensor doubles, the mode
// block of a mode, and the worker's log lines.

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <string>

#include "log_capture.h"
#include "vyrservice.h"

namespace vyr_test {

inline constexpr char kTag[] = "vyrservice";
inline constexpr char kAlsProperty[] = "persist.vendor.camera.vyr_supported";
inline constexpr char kRangeProperty[] = "persist.vendor.camera.vyr_range_supported";
inline constexpr std::chrono::milliseconds kWait{10000};
// A display-state path that cannot be opened: the display monitor ends at once.
inline constexpr char kNoDisplayPath[] = "/nonexistent/vyr-test/display-state";

class ServiceFixture : public ::testing::Test {
  protected:
    // Properties as given (the platform's defaults for the others), no start-up delay.
    static android::vyr::binder::ServiceConfig Config(
        std::map<std::string, bool> properties, const std::string& display_path = kNoDisplayPath);
    // Index of the mode block that serves `mode`.
    static size_t BlockOf(int32_t mode);

    // Records of the worker's `work` line ("EnableWork" / "DisableWork") for `handle`.
    size_t WorkLogCount(const std::string& work, int32_t handle);
    bool WaitForWorkLog(const std::string& work, int32_t handle, size_t count = 1);

    LogCapture log_;
};

}  // namespace vyr_test
