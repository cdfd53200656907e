// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "test_descriptors.h"

#include <dirent.h>
#include <sys/mman.h>
#include <unistd.h>

namespace vyr_test::binder {

ndk::ScopedFileDescriptor MakeTextFile(const std::string& name, const std::string& text) {
    ndk::ScopedFileDescriptor file(memfd_create(name.c_str(), MFD_CLOEXEC));
    if (file.get() < 0) return file;
    if (write(file.get(), text.data(), text.size()) != static_cast<ssize_t>(text.size())) {
        return ndk::ScopedFileDescriptor();
    }
    return file;
}

std::string ReadText(int fd) {
    std::string text;
    char buffer[4096];
    ssize_t n;
    while ((n = pread(fd, buffer, sizeof(buffer), static_cast<off_t>(text.size()))) > 0) {
        text.append(buffer, static_cast<size_t>(n));
    }
    return n < 0 ? std::string() : text;
}

namespace {

// Calls `visit` with the target of each descriptor of process `pid`; how many there are.
template <typename Visit>
size_t ForEachDescriptor(pid_t pid, Visit visit) {
    const std::string dir = "/proc/" + std::to_string(pid) + "/fd";
    DIR* entries = opendir(dir.c_str());
    if (entries == nullptr) return 0;
    size_t count = 0;
    while (const dirent* entry = readdir(entries)) {
        if (entry->d_name[0] == '.') continue;
        // The directory's own descriptor is not counted.
        if (pid == getpid() && std::to_string(dirfd(entries)) == entry->d_name) continue;
        ++count;
        char target[256];
        const std::string link = dir + "/" + entry->d_name;
        const ssize_t n = readlink(link.c_str(), target, sizeof(target) - 1);
        visit(std::string(target, n > 0 ? static_cast<size_t>(n) : 0));
    }
    closedir(entries);
    return count;
}

}  // namespace

size_t CountOpenTextFiles(pid_t pid, const std::string& name) {
    // The kernel names them "/memfd:<name> (deleted)".
    const std::string prefix = "/memfd:" + name + " ";
    size_t count = 0;
    ForEachDescriptor(pid, [&](const std::string& target) {
        if (target.compare(0, prefix.size(), prefix) == 0) ++count;
    });
    return count;
}

size_t CountOwnDescriptors() {
    return ForEachDescriptor(getpid(), [](const std::string&) {});
}

}  // namespace vyr_test::binder
