// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_auto_utils.h>
#include <sys/uio.h>

#include <cstddef>
#include <cstdint>
#include <deque>
#include <vector>

#include "wire.h"

namespace vyr_binder {

// A received frame, owning its bytes.
struct Frame {
    FrameHeader header;
    std::vector<uint8_t> data;
    std::vector<uint8_t> table;
    // The descriptors that came with the frame, as many as its header announced, in the order of
    // the sender's parcel.
    std::vector<ndk::ScopedFileDescriptor> descriptors;
};

// Receive buffers of all connections together may hold at most this much; a connection whose
// buffer would grow beyond it is dropped.
constexpr size_t kMaxBufferedBytesPerProcess = 64u << 20;
// Descriptors received and not yet taken by their frames; a peer that sends more is dropped. A
// read brings those of one send at most (the kernel ends a read after bytes that brought
// descriptors), and a connection reads only while no whole frame is buffered: what it holds is
// the descriptors of the frame arriving and of the one behind it, whose first byte the same read
// may have taken.
constexpr size_t kMaxReceivedDescriptors = 2 * kMaxDescriptorsPerFrame;
// Room for the most descriptors one message can carry (the kernel's SCM_MAX_FD), so that a read
// never truncates them: a truncated read leaves the rest open in this process under qemu-user,
// and a peer that sends more than a frame may carry is then dropped with all of them closed.
constexpr size_t kMaxDescriptorsPerMessage = 253;
// Frames that a peer does not read at once wait in its connection, up to this much; a peer that
// lets more pile up is dropped.
constexpr size_t kMaxPendingSendBytes = 4u << 20;

// The bytes read from one socket and not yet handled. Reads take whatever has arrived, so a
// small frame costs one read; a frame still arriving simply stays buffered. The buffer grows with
// the bytes that actually arrive (at most doubling), never with what a header announces.
class FrameBuffer {
  public:
    enum class Result { kFrame, kNoData, kClosed, kMalformed, kOverLimit };

    FrameBuffer() = default;
    ~FrameBuffer();
    FrameBuffer(const FrameBuffer&) = delete;
    FrameBuffer& operator=(const FrameBuffer&) = delete;

    // Reads until a whole frame is buffered: with `wait` blocking as long as it takes, without
    // it returning kNoData as soon as the socket has nothing more.
    Result Fill(int fd, bool wait);
    // Whether a whole frame is already buffered (kFrame), or the next header is bad.
    Result Check() const;
    // Moves the buffered frame out; Check must have given kFrame.
    void Take(Frame* frame);
    // Whether the last read found nothing more in the socket.
    bool drained() const { return drained_; }
    // Drops what is buffered, closing the descriptors that came with it.
    void Clear();

  private:
    size_t Available() const { return end_ - begin_; }
    // Resizes the buffer within the process-wide budget; false if that would exceed it.
    bool Resize(size_t size);

    // Reads what the socket has into the buffer without waiting, keeping the descriptors that
    // come with it.
    ssize_t Receive(int fd);
    // Until the socket has input or has ended; false on a poll error.
    static bool WaitReadable(int fd);

    std::vector<uint8_t> buffer_;
    // In the order they arrived, which is the order of the frames that announced them.
    std::deque<ndk::ScopedFileDescriptor> descriptors_;
    // A read brought more descriptors than it had room for; the kernel closed the rest, and the
    // stream no longer matches its frames.
    bool lost_descriptors_ = false;
    size_t begin_ = 0;
    size_t end_ = 0;
    bool drained_ = true;
};

// Bytes that all receive buffers of this process hold now.
size_t BufferedBytes();

// Sends as much of the `count` (at most 4) buffers as the socket takes without waiting, and
// tells how many bytes that was; false when the peer is gone. The `descriptors` (at most
// kMaxDescriptorsPerFrame) go with the first byte sent, so with nothing sent they did not go
// either.
bool SendSome(int fd, const iovec* iov, int count, size_t* sent,
              const std::vector<ndk::ScopedFileDescriptor>& descriptors = {});

}  // namespace vyr_binder
