// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "inotify_descriptors.h"

#include <dirent.h>
#include <unistd.h>

#include <cstdlib>
#include <string>

namespace vyr_test::apex {

std::set<int> InotifyDescriptors() {
    std::set<int> result;
    DIR* dir = opendir("/proc/self/fd");
    if (dir == nullptr) return result;
    while (dirent* entry = readdir(dir)) {
        if (entry->d_name[0] == '.') continue;
        std::string link = std::string("/proc/self/fd/") + entry->d_name;
        char target[64];
        ssize_t length = readlink(link.c_str(), target, sizeof(target) - 1);
        if (length < 0) continue;
        target[length] = '\0';
        if (std::string(target) == "anon_inode:inotify") result.insert(atoi(entry->d_name));
    }
    closedir(dir);
    return result;
}

}  // namespace vyr_test::apex
