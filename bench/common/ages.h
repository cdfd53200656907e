// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace vyr_bench {

// "p50 X ms, p99 Y ms (N events)" of ages in nanoseconds (sorted here), or "no events".
std::string AgeSummary(std::vector<int64_t>* ages);
// CLOCK_BOOTTIME now, in nanoseconds: the clock of the service's samples.
int64_t BootTimeNs();

}  // namespace vyr_bench
