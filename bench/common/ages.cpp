// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "ages.h"

#include <time.h>

#include <algorithm>
#include <cstdio>

namespace vyr_bench {

std::string AgeSummary(std::vector<int64_t>* ages) {
    if (ages->empty()) return "no events";
    std::sort(ages->begin(), ages->end());
    const auto at = [ages](double q) {
        return static_cast<double>(
                   (*ages)[std::min(ages->size() - 1, static_cast<size_t>(q * ages->size()))]) /
               1e6;
    };
    char text[96];
    snprintf(text, sizeof(text), "p50 %.2f ms, p99 %.2f ms (%zu events)", at(0.5), at(0.99),
             ages->size());
    return text;
}

int64_t BootTimeNs() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return int64_t{now.tv_sec} * 1000000000 + now.tv_nsec;
}

}  // namespace vyr_bench
