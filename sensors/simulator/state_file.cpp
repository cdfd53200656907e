// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "state_file.h"

#include <android/log.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace sensors_sim {

StateFile& StateFile::Get() {
    // Never destroyed: the light sensor's sampling thread may still publish during exit.
    static StateFile* file = new StateFile();
    return *file;
}

void StateFile::Set(const std::map<std::string, int>& values) {
    std::lock_guard<std::mutex> lock(mutex_);
    bool changed = false;
    for (const auto& [key, value] : values) {
        auto it = values_.find(key);
        if (it == values_.end() || it->second != value) {
            values_[key] = value;
            changed = true;
        }
    }
    if (changed) WriteLocked();
}

void StateFile::WriteLocked() {
    const char* path = getenv(kStateFileVariable);
    if (path == nullptr || *path == '\0') return;
    std::string contents;
    for (const auto& [key, value] : values_) {
        contents += key + "=" + std::to_string(value) + "\n";
    }
    // Written beside the target and renamed over it, so readers never see half a file.
    const std::string temp = std::string(path) + ".tmp." + std::to_string(getpid());
    FILE* file = fopen(temp.c_str(), "we");
    if (file == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, "sensors_sim", "cannot write %s: %s", temp.c_str(),
                            strerror(errno));
        return;
    }
    const bool written = fwrite(contents.data(), 1, contents.size(), file) == contents.size();
    if (fclose(file) != 0 || !written || rename(temp.c_str(), path) != 0) {
        __android_log_print(ANDROID_LOG_ERROR, "sensors_sim", "cannot publish %s: %s", path,
                            strerror(errno));
        unlink(temp.c_str());
    }
}

}  // namespace sensors_sim
