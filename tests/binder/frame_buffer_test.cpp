// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The receive buffer of a connection: what a peer's bytes may make it hold.

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <memory>
#include <thread>
#include <vector>

#include "frame_io.h"
#include "test_descriptors.h"
#include "thread_count.h"
#include "wire.h"

namespace vyr_test::binder {
namespace {

using vyr_binder::BufferedBytes;
using vyr_binder::FrameBuffer;
using vyr_binder::FrameHeader;

class SocketPair {
  public:
    SocketPair() { EXPECT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds_)); }
    ~SocketPair() {
        close(fds_[0]);
        close(fds_[1]);
    }
    int reader() const { return fds_[0]; }
    int writer() const { return fds_[1]; }
    void HangUp() { shutdown(fds_[1], SHUT_WR); }
    // Lets a writer blocked on a full socket fail instead of waiting.
    void CloseReader() { shutdown(fds_[0], SHUT_RDWR); }
    void Write(const void* bytes, size_t size) {
        const uint8_t* next = static_cast<const uint8_t*>(bytes);
        while (size > 0) {
            const ssize_t n = send(fds_[1], next, size, MSG_NOSIGNAL);
            if (n <= 0) return;  // the reader gave up
            next += n;
            size -= static_cast<size_t>(n);
        }
    }

  private:
    int fds_[2] = {-1, -1};
};

FrameHeader SmallFrameHeader() {
    FrameHeader header{};
    header.magic = vyr_binder::kFrameMagic;
    header.type = static_cast<uint32_t>(vyr_binder::FrameType::kReply);
    return header;
}

FrameHeader LargeFrameHeader() {
    FrameHeader header{};
    header.magic = vyr_binder::kFrameMagic;
    header.type = static_cast<uint32_t>(vyr_binder::FrameType::kTransaction);
    header.target = 1;
    header.data_size = vyr_binder::kMaxTransactionBytes;
    return header;
}

TEST(FrameBufferTest, AHeaderAloneDoesNotSizeTheBuffer) {
    const size_t before = BufferedBytes();
    SocketPair pair;
    const FrameHeader header = LargeFrameHeader();
    pair.Write(&header, sizeof(header));
    {
        FrameBuffer buffer;
        EXPECT_EQ(FrameBuffer::Result::kNoData, buffer.Fill(pair.reader(), false));
        EXPECT_LT(BufferedBytes() - before, 64u * 1024) << "a 1 MiB frame was announced, 56 "
                                                           "bytes arrived";
        // The frame arrives after all: the buffer grows with it and is whole at the end.
        std::vector<uint8_t> data(header.data_size, 7);
        std::thread writer([&] { pair.Write(data.data(), data.size()); });
        EXPECT_EQ(FrameBuffer::Result::kFrame, buffer.Fill(pair.reader(), true));
        writer.join();
        vyr_binder::Frame frame;
        buffer.Take(&frame);
        EXPECT_EQ(frame.data, data);
    }
    EXPECT_EQ(BufferedBytes(), before) << "a buffer gives its room back when it goes";
}

// How often a caller waiting for its reply goes to sleep while the peer first takes the call
// it sent and then sends the reply.
unsigned long SleepsOfAWaitingRead() {
    SocketPair pair;
    std::atomic<pid_t> waiter_tid{0};
    unsigned long sleeps = 0;
    FrameBuffer::Result result = FrameBuffer::Result::kMalformed;
    std::thread waiter([&] {
        const std::vector<uint8_t> call(4096, 3);
        EXPECT_EQ(static_cast<ssize_t>(call.size()),
                  send(pair.reader(), call.data(), call.size(), 0));
        const pid_t tid = static_cast<pid_t>(syscall(SYS_gettid));
        const unsigned long before = vyr_test::VoluntarySwitches()[tid];
        waiter_tid = tid;
        FrameBuffer buffer;
        result = buffer.Fill(pair.reader(), true);
        sleeps = vyr_test::VoluntarySwitches()[tid] - before;
    });
    while (waiter_tid.load() == 0) std::this_thread::yield();
    EXPECT_TRUE(vyr_test::WaitUntilAsleep(waiter_tid, std::chrono::seconds(10)));
    // The peer takes the call: the socket has room again, which wakes a plain blocking read.
    std::vector<uint8_t> call(4096);
    EXPECT_EQ(static_cast<ssize_t>(call.size()),
              recv(pair.writer(), call.data(), call.size(), MSG_WAITALL));
    EXPECT_TRUE(vyr_test::WaitUntilAsleep(waiter_tid, std::chrono::seconds(10)));
    const FrameHeader reply = SmallFrameHeader();
    pair.Write(&reply, sizeof(reply));
    waiter.join();
    EXPECT_EQ(FrameBuffer::Result::kFrame, result);
    return sleeps;
}

// A caller waiting for its reply is not woken when the peer reads the call it sent, only when
// the reply comes. A read woken by the peer's taking sleeps twice every time; a sanitizer's
// runtime can add a stray sleep now and then, so one of three tries must show a single sleep.
TEST(FrameBufferTest, AWaitingReadSleepsThroughThePeerTakingWhatItSent) {
    std::vector<unsigned long> sleeps;
    while (sleeps.size() < 3 && (sleeps.empty() || sleeps.back() != 1)) {
        sleeps.push_back(SleepsOfAWaitingRead());
    }
    EXPECT_EQ(1u, sleeps.back()) << "the waiting thread went to sleep more than once for one "
                                    "reply in every try";
}

TEST(FrameBufferTest, AReadThatLeavesBytesInTheSocketIsNotDrained) {
    SocketPair pair;
    const FrameHeader frame = SmallFrameHeader();
    // More than one read takes, less than the socket holds.
    constexpr size_t kFrames = 600;
    const std::vector<FrameHeader> frames(kFrames, frame);
    pair.Write(frames.data(), frames.size() * sizeof(frame));
    FrameBuffer buffer;
    size_t taken = 0;
    ASSERT_EQ(FrameBuffer::Result::kFrame, buffer.Fill(pair.reader(), false));
    EXPECT_FALSE(buffer.drained());
    FrameBuffer::Result result = FrameBuffer::Result::kFrame;
    while (result == FrameBuffer::Result::kFrame) {
        vyr_binder::Frame taken_frame;
        buffer.Take(&taken_frame);
        ++taken;
        result = buffer.Fill(pair.reader(), false);
    }
    EXPECT_EQ(FrameBuffer::Result::kNoData, result);
    EXPECT_EQ(kFrames, taken);
    EXPECT_TRUE(buffer.drained());
}

TEST(FrameBufferTest, BuffersOfAllConnectionsStayUnderTheProcessLimit) {
    const FrameHeader header = LargeFrameHeader();
    // Each peer sends all of a large frame but its last byte, and hangs up.
    const std::vector<uint8_t> most(header.data_size - 1, 1);
    std::vector<std::unique_ptr<SocketPair>> pairs;
    std::vector<std::unique_ptr<FrameBuffer>> buffers;
    bool refused = false;
    const size_t peers = 2 * vyr_binder::kMaxBufferedBytesPerProcess / header.data_size;
    for (size_t i = 0; i < peers && !refused; ++i) {
        pairs.push_back(std::make_unique<SocketPair>());
        buffers.push_back(std::make_unique<FrameBuffer>());
        SocketPair* pair = pairs.back().get();
        std::thread writer([&] {
            pair->Write(&header, sizeof(header));
            pair->Write(most.data(), most.size());
            pair->HangUp();
        });
        const FrameBuffer::Result result = buffers.back()->Fill(pair->reader(), true);
        // Reading stops at the limit; the peer's remaining bytes are left unread.
        if (result == FrameBuffer::Result::kOverLimit) {
            refused = true;
            pair->CloseReader();
        } else {
            EXPECT_EQ(FrameBuffer::Result::kClosed, result);
        }
        writer.join();
        EXPECT_LE(BufferedBytes(), vyr_binder::kMaxBufferedBytesPerProcess);
    }
    EXPECT_TRUE(refused) << peers << " peers of almost 1 MiB each were all buffered";
}

// `count` copies of `fd`, as the runtime sends a parcel's.
std::vector<ndk::ScopedFileDescriptor> Copies(int fd, size_t count) {
    std::vector<ndk::ScopedFileDescriptor> copies;
    for (size_t i = 0; i < count; ++i) copies.emplace_back(dup(fd));
    return copies;
}

// Sends a frame header with `descriptors` on its first byte.
void SendHeader(int fd, const FrameHeader& header,
                const std::vector<ndk::ScopedFileDescriptor>& descriptors) {
    iovec iov{const_cast<FrameHeader*>(&header), sizeof(header)};
    size_t sent = 0;
    ASSERT_TRUE(vyr_binder::SendSome(fd, &iov, 1, &sent, descriptors));
    ASSERT_EQ(sizeof(header), sent);
}

TEST(FrameBufferTest, EachFrameTakesTheDescriptorsItAnnouncedInOrder) {
    ndk::ScopedFileDescriptor first = MakeTextFile("vyr.first", "first");
    ndk::ScopedFileDescriptor second = MakeTextFile("vyr.second", "second");
    SocketPair pair;
    FrameHeader header = SmallFrameHeader();
    header.descriptor_count = 2;
    std::vector<ndk::ScopedFileDescriptor> two = Copies(first.get(), 1);
    two.emplace_back(dup(second.get()));
    SendHeader(pair.writer(), header, two);
    header.descriptor_count = 1;
    SendHeader(pair.writer(), header, Copies(second.get(), 1));
    header.descriptor_count = 0;
    SendHeader(pair.writer(), header, {});
    FrameBuffer buffer;
    vyr_binder::Frame frame;
    ASSERT_EQ(FrameBuffer::Result::kFrame, buffer.Fill(pair.reader(), true));
    buffer.Take(&frame);
    ASSERT_EQ(2u, frame.descriptors.size());
    EXPECT_EQ("first", ReadText(frame.descriptors[0].get()));
    EXPECT_EQ("second", ReadText(frame.descriptors[1].get()));
    ASSERT_EQ(FrameBuffer::Result::kFrame, buffer.Fill(pair.reader(), true));
    buffer.Take(&frame);
    ASSERT_EQ(1u, frame.descriptors.size());
    EXPECT_EQ("second", ReadText(frame.descriptors[0].get()));
    ASSERT_EQ(FrameBuffer::Result::kFrame, buffer.Fill(pair.reader(), true));
    buffer.Take(&frame);
    EXPECT_TRUE(frame.descriptors.empty());
}

// What a connection that goes away holds of a frame still arriving is closed with its buffer.
TEST(FrameBufferTest, DescriptorsOfAFrameStillArrivingAreClosedWithTheBuffer) {
    const std::string name = "vyr.arriving.test";
    ndk::ScopedFileDescriptor file = MakeTextFile(name, "");
    SocketPair pair;
    FrameHeader header = LargeFrameHeader();
    header.descriptor_count = 2;
    SendHeader(pair.writer(), header, Copies(file.get(), 2));
    {
        FrameBuffer buffer;
        EXPECT_EQ(FrameBuffer::Result::kNoData, buffer.Fill(pair.reader(), false));
        EXPECT_EQ(3u, CountOpenTextFiles(getpid(), name));
    }
    EXPECT_EQ(1u, CountOpenTextFiles(getpid(), name));
}

}  // namespace
}  // namespace vyr_test::binder
