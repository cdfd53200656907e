// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The service worker's "EnableWork"/"DisableWork" log lines, matched per client handle.

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "log_capture.h"

namespace vyr_test {

// Lower-case hexadecimal, as the service prints handles.
std::string Hex(int32_t value);
// The worker's line for an applied enable item, and for a disable item.
std::string EnableWorkLine(int32_t mode, int count, int32_t handle, int period, int active,
                           int sensor_type);
std::string DisableWorkLine(int32_t mode, int count, int32_t handle, int active, int sensor_type);
// Number of INFO records of tag "vyrservice" that are the worker's `work` line for `handle`.
size_t CountWorkLogs(const std::vector<LogRecord>& records, const std::string& work, int32_t handle);

}  // namespace vyr_test
