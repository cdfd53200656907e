// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// A connection in the looper, fed by a peer on the other end of a socket pair.

#include "connection.h"

#include <android/binder_parcel_utils.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <vyr/binder_host.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "frame_io.h"
#include "looper.h"
#include "parcel.h"
#include "process_state.h"
#include "test_descriptors.h"
#include "thread_count.h"
#include "wait_until.h"
#include "wire.h"

namespace vyr_test::binder {
namespace {

using namespace std::chrono_literals;

class ConnectionTest : public ::testing::Test {
  protected:
    // Closes what a test left in the looper and joins the runtime's threads, its sending tasks
    // among them.
    void TearDown() override { VyrBinder_shutdown(); }
};

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
TEST_F(ConnectionTest, APeerThatHangsUpRightAfterItsLastFrameIsDropped) {
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

// The runtime's end of a socket pair, in the looper, as a connection to a peer.
std::shared_ptr<vyr_binder::Connection> Connect(int fd, bool input) {
    vyr_binder::Looper& looper = vyr_binder::ProcessState::Get().looper();
    auto connection = std::make_shared<vyr_binder::Connection>(fd);
    looper.Add(connection);
    connection->Watch(input);
    return connection;
}

// A parcel that holds `count` copies of `fd`.
void WriteDescriptors(AParcel* parcel, int fd, int count) {
    for (int i = 0; i < count; ++i) {
        ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(parcel, fd));
    }
}

// Sends a frame of `type` with the parcel's data and copies of its descriptors, as the runtime
// sends one.
void SendFrame(int fd, vyr_binder::FrameType type, uint64_t id, const AParcel& parcel) {
    vyr_binder::FrameHeader header{};
    header.magic = vyr_binder::kFrameMagic;
    header.type = static_cast<uint32_t>(type);
    header.transaction_id = id;
    header.data_size = static_cast<uint32_t>(parcel.data.size());
    header.descriptor_count = static_cast<uint32_t>(parcel.fds.size());
    std::vector<ndk::ScopedFileDescriptor> copies;
    for (const ndk::ScopedFileDescriptor& descriptor : parcel.fds) {
        copies.emplace_back(dup(descriptor.get()));
    }
    iovec iov[2] = {{&header, sizeof(header)},
                    {const_cast<uint8_t*>(parcel.data.data()), parcel.data.size()}};
    size_t sent = 0;
    ASSERT_TRUE(vyr_binder::SendSome(fd, iov, 2, &sent, copies));
    ASSERT_EQ(sizeof(header) + parcel.data.size(), sent);
}

pid_t ThreadId() {
    return static_cast<pid_t>(syscall(SYS_gettid));
}

// A frame with descriptors that waits in the connection's queue, behind a frame the peer has not
// taken yet, still carries them on its own first byte; the queue's copies are closed once sent.
TEST_F(ConnectionTest, DescriptorsQueuedBehindUnsentBytesGoWithTheirOwnFrame) {
    const std::string name = "vyr.queued.test";
    ndk::ScopedFileDescriptor file = MakeTextFile(name, "queued");
    int fds[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds));
    std::shared_ptr<vyr_binder::Connection> connection = Connect(fds[0], false);
    // More than the socket holds.
    AParcel large;
    large.data.assign(900 * 1024, 1);
    auto small = std::make_unique<AParcel>();
    WriteDescriptors(small.get(), file.get(), 2);
    binder_status_t statuses[2] = {STATUS_UNKNOWN_ERROR, STATUS_UNKNOWN_ERROR};
    std::atomic<pid_t> tids[2] = {{0}, {0}};
    const auto call = [&](int i, const AParcel& in) {
        tids[i] = ThreadId();
        AParcel out;
        statuses[i] = connection->Transact(1, FIRST_CALL_TRANSACTION, in, &out, 0);
    };
    // Each sends without waiting, then sleeps until its reply comes, or until the peer hangs up
    // when a check below fails.
    std::thread first(call, 0, std::cref(large));
    while (tids[0] == 0) std::this_thread::yield();
    EXPECT_TRUE(vyr_test::WaitUntilAsleep(tids[0], 10s));
    std::thread second(call, 1, std::cref(*small));
    while (tids[1] == 0) std::this_thread::yield();
    EXPECT_TRUE(vyr_test::WaitUntilAsleep(tids[1], 10s));
    // The peer takes both frames and answers them.
    const auto serve = [&] {
        vyr_binder::FrameBuffer peer;
        vyr_binder::Frame frames[2];
        size_t taken = 0;
        while (taken < 2 && peer.Fill(fds[1], true) == vyr_binder::FrameBuffer::Result::kFrame) {
            peer.Take(&frames[taken++]);
        }
        ASSERT_EQ(2u, taken) << "the frames did not arrive as sent";
        EXPECT_EQ(large.data.size(), frames[0].data.size());
        EXPECT_TRUE(frames[0].descriptors.empty());
        ASSERT_EQ(2u, frames[1].descriptors.size());
        EXPECT_EQ("queued", ReadText(frames[1].descriptors[1].get()));
        for (const vyr_binder::Frame& frame : frames) {
            SendFrame(fds[1], vyr_binder::FrameType::kReply, frame.header.transaction_id, AParcel());
        }
    };
    serve();
    // After a failed check the callers still wait: the peer's hang-up fails their calls.
    if (HasFatalFailure()) shutdown(fds[1], SHUT_RDWR);
    first.join();
    second.join();
    EXPECT_EQ(STATUS_OK, statuses[0]);
    EXPECT_EQ(STATUS_OK, statuses[1]);
    small.reset();
    EXPECT_TRUE(vyr_test::WaitUntil([&] { return CountOpenTextFiles(getpid(), name) == 1; }, 10s))
        << CountOpenTextFiles(getpid(), name) << " open";
    close(fds[1]);
    connection.reset();
}

// A reply's descriptors reach the caller's reply parcel; a reply that nobody waits for is
// malformed, and the descriptors that came with it are closed with the connection.
TEST_F(ConnectionTest, AReplyCarriesItsDescriptorsToTheCallerAndOneToNobodyLosesThem) {
    const std::string name = "vyr.reply.test";
    ndk::ScopedFileDescriptor file = MakeTextFile(name, "reply");
    int fds[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds));
    std::shared_ptr<vyr_binder::Connection> connection = Connect(fds[0], true);
    binder_status_t status = STATUS_UNKNOWN_ERROR;
    std::vector<std::string> texts;
    std::thread caller([&] {
        AParcel in;
        AParcel out;
        status = connection->Transact(1, FIRST_CALL_TRANSACTION, in, &out, 0);
        for (int i = 0; i < 2 && status == STATUS_OK; ++i) {
            ndk::ScopedFileDescriptor read;
            EXPECT_EQ(STATUS_OK, ndk::AParcel_readRequiredParcelFileDescriptor(&out, &read));
            texts.push_back(ReadText(read.get()));
        }
    });
    vyr_binder::FrameBuffer peer;
    AParcel reply;
    // The peer takes the call and answers it.
    const auto serve = [&] {
        vyr_binder::Frame frame;
        ASSERT_EQ(vyr_binder::FrameBuffer::Result::kFrame, peer.Fill(fds[1], true));
        peer.Take(&frame);
        WriteDescriptors(&reply, file.get(), 2);
        SendFrame(fds[1], vyr_binder::FrameType::kReply, frame.header.transaction_id, reply);
    };
    serve();
    // After a failed check the caller still waits: the peer's hang-up fails its call.
    if (HasFatalFailure()) shutdown(fds[1], SHUT_RDWR);
    caller.join();
    EXPECT_EQ(STATUS_OK, status);
    EXPECT_EQ((std::vector<std::string>{"reply", "reply"}), texts);
    AParcel stray;
    WriteDescriptors(&stray, file.get(), 1);
    SendFrame(fds[1], vyr_binder::FrameType::kReply, 999, stray);
    stray.Clear();
    reply.Clear();
    EXPECT_TRUE(ClosedWithin(fds[1], 10s));
    EXPECT_TRUE(vyr_test::WaitUntil([&] { return CountOpenTextFiles(getpid(), name) == 1; }, 10s))
        << CountOpenTextFiles(getpid(), name) << " open";
    close(fds[1]);
}

// A connection closed as VyrBinder_shutdown closes them closes the descriptors of a frame still
// arriving at once, while a proxy to the peer may still hold the connection.
TEST_F(ConnectionTest, DescriptorsOfAFrameStillArrivingAreClosedWhenTheConnectionEnds) {
    const std::string name = "vyr.ends.test";
    ndk::ScopedFileDescriptor file = MakeTextFile(name, "");
    int fds[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds));
    std::shared_ptr<vyr_binder::Connection> connection = Connect(fds[0], true);
    vyr_binder::FrameHeader header{};
    header.magic = vyr_binder::kFrameMagic;
    header.type = static_cast<uint32_t>(vyr_binder::FrameType::kTransaction);
    header.target = 1;
    header.data_size = 100;
    header.descriptor_count = 1;
    std::vector<ndk::ScopedFileDescriptor> copies;
    copies.emplace_back(dup(file.get()));
    iovec iov{&header, sizeof(header)};
    size_t sent = 0;
    ASSERT_TRUE(vyr_binder::SendSome(fds[1], &iov, 1, &sent, copies));
    copies.clear();
    ASSERT_TRUE(vyr_test::WaitUntil([&] { return CountOpenTextFiles(getpid(), name) == 2; }, 10s))
        << "the runtime never read the frame's start";
    connection->Close();
    EXPECT_TRUE(vyr_test::WaitUntil([&] { return CountOpenTextFiles(getpid(), name) == 1; }, 10s))
        << CountOpenTextFiles(getpid(), name) << " open";
    EXPECT_TRUE(connection->dead());
    connection.reset();
    close(fds[1]);
}

}  // namespace
}  // namespace vyr_test::binder
