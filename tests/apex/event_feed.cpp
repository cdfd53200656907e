// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "event_feed.h"

#include <gtest/gtest.h>
#include <sys/inotify.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace vyr_test::apex {

EventFeed::EventFeed() {
    int ends[2];
    if (socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends) != 0) {
        ADD_FAILURE() << "socketpair: " << strerror(errno);
        return;
    }
    listener_end_ = ends[0];
    test_end_ = ends[1];
}

EventFeed::~EventFeed() {
    Close();
    if (listener_end_ >= 0) close(listener_end_);
}

int EventFeed::TakeListenerEnd() {
    int fd = listener_end_;
    listener_end_ = -1;
    return fd;
}

std::string EventFeed::Record(uint32_t mask) {
    inotify_event event{};
    event.wd = 1;
    event.mask = mask;
    return std::string(reinterpret_cast<const char*>(&event), sizeof(event));
}

bool EventFeed::Send(const std::string& bytes) {
    ssize_t sent = send(test_end_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent != static_cast<ssize_t>(bytes.size())) {
        ADD_FAILURE() << "send of " << bytes.size() << " bytes gave " << sent << ": "
                      << strerror(errno);
        return false;
    }
    return true;
}

bool EventFeed::SendRecords(const std::vector<uint32_t>& masks) {
    std::string bytes;
    for (uint32_t mask : masks) bytes += Record(mask);
    return Send(bytes);
}

void EventFeed::Close() {
    if (test_end_ >= 0) close(test_end_);
    test_end_ = -1;
}

}  // namespace vyr_test::apex
