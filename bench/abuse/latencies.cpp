// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "latencies.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

namespace vyr_bench::abuse {

void Latencies::Add(std::chrono::nanoseconds duration) {
    std::lock_guard<std::mutex> lock(mutex_);
    nanos_.push_back(duration.count());
}

size_t Latencies::Count() {
    std::lock_guard<std::mutex> lock(mutex_);
    return nanos_.size();
}

double Latencies::PercentileMicros(double p) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (nanos_.empty()) return 0;
    std::vector<int64_t> sorted = nanos_;
    const size_t rank =
        std::min(sorted.size() - 1, static_cast<size_t>(std::ceil(p / 100 * sorted.size())) - 1);
    std::nth_element(sorted.begin(), sorted.begin() + rank, sorted.end());
    return sorted[rank] / 1000.0;
}

std::string Latencies::Summary() {
    char text[128];
    snprintf(text, sizeof(text), "%zu calls, p50 %.0f us, p99 %.0f us, max %.0f us", Count(),
             PercentileMicros(50), PercentileMicros(99), PercentileMicros(100));
    return text;
}

}  // namespace vyr_bench::abuse
