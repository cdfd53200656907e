// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "peers.h"

#include <android-base/file.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <condition_variable>
#include <mutex>

namespace vyr_bench {

std::vector<int> ForkPeers(int count, void (*serve)(int fd)) {
    std::vector<int> fds;
    for (int i = 0; i < count; ++i) {
        int pair[2];
        if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, pair) != 0) {
            EndPeers(fds);
            return {};
        }
        if (fork() == 0) {
            close(pair[0]);
            serve(pair[1]);
        }
        close(pair[1]);
        fds.push_back(pair[0]);
    }
    return fds;
}

void EndPeers(const std::vector<int>& fds) {
    for (int fd : fds) close(fd);
    while (wait(nullptr) > 0) {
    }
}

bool RoundTrip(int fd, const char* event, char* reply) {
    if (write(fd, event, kEventBytes) != static_cast<ssize_t>(kEventBytes)) return false;
    pollfd readable{fd, POLLIN, 0};
    poll(&readable, 1, -1);
    return android::base::ReadFully(fd, reply, kReplyBytes);
}

void WaitUntil(std::chrono::steady_clock::time_point deadline) {
    std::mutex mutex;
    std::condition_variable cv;
    std::unique_lock<std::mutex> lock(mutex);
    while (std::chrono::steady_clock::now() < deadline) cv.wait_until(lock, deadline);
}

}  // namespace vyr_bench
