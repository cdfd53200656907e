// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "process_stats.h"

#include <dirent.h>

#include "test_files.h"

namespace vyr_bench::abuse {
namespace {

long CountEntries(const std::string& dir_path) {
    DIR* dir = opendir(dir_path.c_str());
    if (dir == nullptr) return -1;
    long count = 0;
    while (dirent* entry = readdir(dir)) {
        if (entry->d_name[0] != '.') ++count;
    }
    closedir(dir);
    return count;
}

}  // namespace

ProcessStats ProcessStats::Of(pid_t pid) {
    const std::string proc = "/proc/" + std::to_string(pid);
    ProcessStats stats;
    stats.rss_kib = vyr_test::ResidentKib(pid);
    stats.fds = CountEntries(proc + "/fd");
    stats.threads = CountEntries(proc + "/task");
    return stats;
}

std::string ProcessStats::ToString() const {
    return "RSS " + std::to_string(rss_kib) + " KiB, " + std::to_string(fds) + " fds, " +
           std::to_string(threads) + " threads";
}

}  // namespace vyr_bench::abuse
