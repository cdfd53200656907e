// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "frame_io.h"

#include <errno.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/uio.h>

#include <algorithm>
#include <atomic>
#include <cstring>

namespace vyr_binder {
namespace {

constexpr size_t kReadChunk = 16 * 1024;

std::atomic<size_t> g_buffered_bytes{0};

size_t FrameSize(const FrameHeader& header) {
    return sizeof(FrameHeader) + header.data_size + header.table_size;
}

}  // namespace

size_t BufferedBytes() {
    return g_buffered_bytes.load(std::memory_order_relaxed);
}

FrameBuffer::~FrameBuffer() {
    g_buffered_bytes.fetch_sub(buffer_.size(), std::memory_order_relaxed);
}

bool FrameBuffer::Resize(size_t size) {
    if (size > buffer_.size()) {
        const size_t growth = size - buffer_.size();
        if (g_buffered_bytes.fetch_add(growth, std::memory_order_relaxed) + growth >
            kMaxBufferedBytesPerProcess) {
            g_buffered_bytes.fetch_sub(growth, std::memory_order_relaxed);
            return false;
        }
        buffer_.resize(size);
        return true;
    }
    g_buffered_bytes.fetch_sub(buffer_.size() - size, std::memory_order_relaxed);
    std::vector<uint8_t>(buffer_.begin(), buffer_.begin() + size).swap(buffer_);
    return true;
}

FrameBuffer::Result FrameBuffer::Check() const {
    if (Available() < sizeof(FrameHeader)) return Result::kNoData;
    FrameHeader header;
    std::memcpy(&header, buffer_.data() + begin_, sizeof(header));
    if (!ValidateHeader(header)) return Result::kMalformed;
    if (Available() < FrameSize(header)) return Result::kNoData;
    // Descriptors come with their frame's first byte, so this frame's are here by now.
    return header.descriptor_count <= descriptors_.size() ? Result::kFrame : Result::kMalformed;
}

FrameBuffer::Result FrameBuffer::Fill(int fd, bool wait) {
    for (;;) {
        Result result = Check();
        if (result != Result::kNoData) return result;
        // Room for the rest of the frame once its header is known, but never more than what has
        // arrived so far again: a header alone cannot make the buffer large.
        size_t needed = kReadChunk;
        if (Available() >= sizeof(FrameHeader)) {
            FrameHeader header;
            std::memcpy(&header, buffer_.data() + begin_, sizeof(header));
            needed = std::min(FrameSize(header), std::max(kReadChunk, 2 * Available()));
        }
        if (begin_ > 0 && buffer_.size() - begin_ < needed) {
            std::memmove(buffer_.data(), buffer_.data() + begin_, Available());
            end_ -= begin_;
            begin_ = 0;
        }
        if (buffer_.size() - begin_ < needed && !Resize(begin_ + needed)) {
            return Result::kOverLimit;
        }
        // A thread blocked in recvmsg on a Unix socket is also woken each time the peer reads
        // what this side sent (write space); poll for input alone sleeps through those.
        if (wait && !WaitReadable(fd)) return Result::kClosed;
        const size_t room = buffer_.size() - end_;
        const size_t descriptors = descriptors_.size();
        ssize_t n = Receive(fd);
        if (n > 0 && (lost_descriptors_ || descriptors_.size() > kMaxReceivedDescriptors)) {
            return Result::kMalformed;
        }
        if (n > 0) {
            end_ += static_cast<size_t>(n);
            // A read stops early at bytes that brought descriptors, with more behind them.
            drained_ = static_cast<size_t>(n) < room && descriptors_.size() == descriptors;
            continue;
        }
        if (n == 0) return Result::kClosed;
        if (errno == EINTR) continue;
        if (errno == EAGAIN || errno == EWOULDBLOCK) {
            drained_ = true;
            if (wait) continue;
            return Result::kNoData;
        }
        return Result::kClosed;
    }
}

bool FrameBuffer::WaitReadable(int fd) {
    pollfd readable{fd, POLLIN, 0};
    while (poll(&readable, 1, -1) < 0) {
        if (errno != EINTR) return false;
    }
    return true;
}

ssize_t FrameBuffer::Receive(int fd) {
    iovec iov{buffer_.data() + end_, buffer_.size() - end_};
    alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int) * kMaxDescriptorsPerMessage)];
    msghdr msg{};
    msg.msg_iov = &iov;
    msg.msg_iovlen = 1;
    msg.msg_control = control;
    msg.msg_controllen = sizeof(control);
    const ssize_t n = recvmsg(fd, &msg, MSG_CMSG_CLOEXEC | MSG_DONTWAIT);
    if (n < 0) return n;
    for (cmsghdr* c = CMSG_FIRSTHDR(&msg); c != nullptr; c = CMSG_NXTHDR(&msg, c)) {
        if (c->cmsg_level != SOL_SOCKET || c->cmsg_type != SCM_RIGHTS) continue;
        const size_t count = (c->cmsg_len - CMSG_LEN(0)) / sizeof(int);
        for (size_t i = 0; i < count; ++i) {
            int received;
            std::memcpy(&received, CMSG_DATA(c) + i * sizeof(int), sizeof(int));
            descriptors_.emplace_back(received);
        }
    }
    if ((msg.msg_flags & MSG_CTRUNC) != 0) lost_descriptors_ = true;
    return n;
}

void FrameBuffer::Take(Frame* frame) {
    std::memcpy(&frame->header, buffer_.data() + begin_, sizeof(FrameHeader));
    // Check made sure that they are here.
    frame->descriptors.clear();
    for (uint32_t i = 0; i < frame->header.descriptor_count; ++i) {
        frame->descriptors.push_back(std::move(descriptors_.front()));
        descriptors_.pop_front();
    }
    const uint8_t* data = buffer_.data() + begin_ + sizeof(FrameHeader);
    frame->data.assign(data, data + frame->header.data_size);
    const uint8_t* table = data + frame->header.data_size;
    frame->table.assign(table, table + frame->header.table_size);
    begin_ += FrameSize(frame->header);
    if (begin_ == end_) {
        begin_ = end_ = 0;
        // Give back the room a large frame took.
        if (buffer_.size() > 4 * kReadChunk) Resize(kReadChunk);
    }
}

void FrameBuffer::Clear() {
    descriptors_.clear();
    begin_ = end_ = 0;
    Resize(0);
}

bool SendSome(int fd, const iovec* iov, int count, size_t* sent,
              const std::vector<ndk::ScopedFileDescriptor>& descriptors) {
    *sent = 0;
    // Callers keep to the limit; the control buffer is never overrun all the same.
    if (descriptors.size() > kMaxDescriptorsPerFrame) return false;
    iovec rest[4];
    int first = 0;
    for (int i = 0; i < count; ++i) rest[i] = iov[i];
    while (first < count) {
        msghdr msg{};
        msg.msg_iov = rest + first;
        msg.msg_iovlen = static_cast<size_t>(count - first);
        alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int) * kMaxDescriptorsPerMessage)];
        if (!descriptors.empty() && *sent == 0) {
            const size_t bytes = sizeof(int) * descriptors.size();
            msg.msg_control = control;
            msg.msg_controllen = CMSG_SPACE(bytes);
            cmsghdr* c = CMSG_FIRSTHDR(&msg);
            c->cmsg_level = SOL_SOCKET;
            c->cmsg_type = SCM_RIGHTS;
            c->cmsg_len = CMSG_LEN(bytes);
            for (size_t i = 0; i < descriptors.size(); ++i) {
                const int descriptor = descriptors[i].get();
                std::memcpy(CMSG_DATA(c) + i * sizeof(int), &descriptor, sizeof(int));
            }
        }
        ssize_t n = sendmsg(fd, &msg, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (n < 0) {
            if (errno == EINTR) continue;
            return errno == EAGAIN || errno == EWOULDBLOCK;
        }
        size_t taken = static_cast<size_t>(n);
        *sent += taken;
        while (first < count && taken >= rest[first].iov_len) {
            taken -= rest[first].iov_len;
            ++first;
        }
        if (first < count) {
            rest[first].iov_base = static_cast<uint8_t*>(rest[first].iov_base) + taken;
            rest[first].iov_len -= taken;
        }
    }
    return true;
}

}  // namespace vyr_binder
