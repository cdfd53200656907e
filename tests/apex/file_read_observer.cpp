// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "file_read_observer.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace vyr_test::apex {

FileReadObserver::FileReadObserver(const std::string& path) {
    fd_ = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
    if (fd_ < 0) {
        ADD_FAILURE() << "inotify_init1: " << strerror(errno);
        return;
    }
    // Opens are watched too, so that the closes of back-to-back reads alternate with them and the
    // kernel cannot merge them into one event.
    if (inotify_add_watch(fd_, path.c_str(), IN_OPEN | IN_CLOSE_NOWRITE) < 0) {
        ADD_FAILURE() << "inotify_add_watch(" << path << "): " << strerror(errno);
    }
}

FileReadObserver::~FileReadObserver() {
    if (fd_ >= 0) close(fd_);
}

bool FileReadObserver::Collect() {
    alignas(inotify_event) char buffer[4096];
    while (true) {
        ssize_t length = read(fd_, buffer, sizeof(buffer));
        if (length < 0) return errno == EAGAIN;
        for (ssize_t offset = 0; offset < length;) {
            inotify_event event;
            memcpy(&event, buffer + offset, sizeof(event));
            if ((event.mask & IN_CLOSE_NOWRITE) != 0) ++pending_;
            offset += sizeof(event) + event.len;
        }
    }
}

void FileReadObserver::Drain() {
    Collect();
    pending_ = 0;
}

bool FileReadObserver::WaitForRead(std::chrono::milliseconds timeout) {
    auto deadline = std::chrono::steady_clock::now() + timeout;
    while (Collect() && pending_ == 0) {
        auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
            deadline - std::chrono::steady_clock::now());
        if (left.count() <= 0) return false;
        pollfd request{fd_, POLLIN, 0};
        if (poll(&request, 1, static_cast<int>(left.count())) < 0 && errno != EINTR) {
            return false;
        }
    }
    if (pending_ == 0) return false;
    --pending_;
    return true;
}

}  // namespace vyr_test::apex
