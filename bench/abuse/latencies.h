// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Call durations from several threads, summarised as percentiles.

#include <chrono>
#include <mutex>
#include <string>
#include <vector>

namespace vyr_bench::abuse {

class Latencies {
  public:
    void Add(std::chrono::nanoseconds duration);
    size_t Count();
    // The p-th percentile (0 < p <= 100) in microseconds; 0 when nothing was added.
    double PercentileMicros(double p);
    // "n calls, p50 X us, p99 Y us, max Z us".
    std::string Summary();

  private:
    std::mutex mutex_;
    std::vector<int64_t> nanos_;
};

}  // namespace vyr_bench::abuse
