// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// What the kernel says a process holds: resident memory, open descriptors, threads.

#include <sys/types.h>

#include <string>

namespace vyr_bench::abuse {

struct ProcessStats {
    long rss_kib = -1;
    long fds = -1;
    long threads = -1;

    static ProcessStats Of(pid_t pid);
    std::string ToString() const;
};

}  // namespace vyr_bench::abuse
