// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// A connection in the looper, fed by a peer on the other end of a socket pair.

#include "connection.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <memory>

#include "looper.h"
#include "process_state.h"
#include "wire.h"

namespace vyr_test::binder {
namespace {

using namespace std::chrono_literals;

// True once the runtime closed its end: everything it sent is read and dropped first.
bool ClosedWithin(int fd, std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    char sink[4096];
    while (std::chrono::steady_clock::now() < deadline) {
        pollfd p{fd, POLLIN, 0};
        if (poll(&p, 1, 50) <= 0) continue;
        if (read(fd, sink, sizeof(sink)) <= 0) return true;
    }
    return false;
}

// The frame and the end of the stream are both in the socket when the looper first looks: one
// wake-up reports both, and one read takes only the frame.
TEST(ConnectionTest, APeerThatHangsUpRightAfterItsLastFrameIsDropped) {
    int fds[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds));
    vyr_binder::FrameHeader header{};
    header.magic = vyr_binder::kFrameMagic;
    header.type = static_cast<uint32_t>(vyr_binder::FrameType::kRelease);
    header.target = 12345;  // never handed out: the release is ignored, the connection kept
    header.code = 1;
    ASSERT_EQ(static_cast<ssize_t>(sizeof(header)),
              send(fds[1], &header, sizeof(header), MSG_NOSIGNAL));
    ASSERT_EQ(0, shutdown(fds[1], SHUT_WR));

    vyr_binder::Looper& looper = vyr_binder::ProcessState::Get().looper();
    auto connection = std::make_shared<vyr_binder::Connection>(fds[0]);
    looper.Add(connection);
    connection->Watch(true);
    connection.reset();

    EXPECT_TRUE(ClosedWithin(fds[1], 10s));
    close(fds[1]);
}

}  // namespace
}  // namespace vyr_test::binder
