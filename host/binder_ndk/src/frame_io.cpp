#include "frame_io.h"

#include <errno.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/uio.h>

#include <cstring>

namespace vyr_binder {
namespace {

// How long the rest of a started frame, or room to send one, may take to come.
constexpr int kStallMillis = 10000;

enum class Chunk { kDone, kNoData, kClosed, kStalled };

// Reads `size` bytes, blocking until all are there: a caller waiting for its reply has nothing
// better to do.
Chunk ReadBlocking(int fd, uint8_t* buffer, size_t size) {
    size_t done = 0;
    while (done < size) {
        ssize_t n = recv(fd, buffer + done, size - done, MSG_WAITALL);
        if (n > 0) {
            done += static_cast<size_t>(n);
        } else if (n == 0 || errno != EINTR) {
            return Chunk::kClosed;
        }
    }
    return Chunk::kDone;
}

// Reads `size` bytes. Before the first byte it waits for ever (wait) or not at all; after it,
// a stalled peer ends the read.
Chunk ReadExact(int fd, uint8_t* buffer, size_t size, bool wait_for_first) {
    size_t done = 0;
    while (done < size) {
        ssize_t n = recv(fd, buffer + done, size - done, MSG_DONTWAIT);
        if (n > 0) {
            done += static_cast<size_t>(n);
            continue;
        }
        if (n == 0) return Chunk::kClosed;
        if (errno == EINTR) continue;
        if (errno != EAGAIN && errno != EWOULDBLOCK) return Chunk::kClosed;
        if (done == 0 && !wait_for_first) return Chunk::kNoData;
        pollfd p{fd, POLLIN, 0};
        int ready = poll(&p, 1, done == 0 ? -1 : kStallMillis);
        if (ready == 0) return Chunk::kStalled;
        if (ready < 0 && errno != EINTR) return Chunk::kClosed;
    }
    return Chunk::kDone;
}

}  // namespace

ReadResult ReadFrame(int fd, bool wait, Frame* frame) {
    uint8_t* header = reinterpret_cast<uint8_t*>(&frame->header);
    Chunk chunk = wait ? ReadBlocking(fd, header, sizeof(FrameHeader))
                       : ReadExact(fd, header, sizeof(FrameHeader), false);
    if (chunk == Chunk::kNoData) return ReadResult::kNoData;
    if (chunk == Chunk::kStalled) return ReadResult::kMalformed;
    if (chunk != Chunk::kDone) return ReadResult::kClosed;
    if (!ValidateHeader(frame->header)) return ReadResult::kMalformed;
    frame->data.resize(frame->header.data_size);
    frame->table.resize(frame->header.table_size);
    for (std::vector<uint8_t>* part : {&frame->data, &frame->table}) {
        if (part->empty()) continue;
        chunk = wait ? ReadBlocking(fd, part->data(), part->size())
                     : ReadExact(fd, part->data(), part->size(), true);
        if (chunk == Chunk::kStalled) return ReadResult::kMalformed;
        if (chunk != Chunk::kDone) return ReadResult::kClosed;
    }
    return ReadResult::kFrame;
}

bool SendFrame(int fd, const FrameHeader& header, const uint8_t* data,
               const std::vector<uint8_t>& table) {
    iovec iov[3] = {
        {const_cast<FrameHeader*>(&header), sizeof(header)},
        {const_cast<uint8_t*>(data), header.data_size},
        {const_cast<uint8_t*>(table.data()), table.size()},
    };
    size_t first = 0;
    while (first < 3) {
        msghdr msg{};
        msg.msg_iov = iov + first;
        msg.msg_iovlen = 3 - first;
        ssize_t n = sendmsg(fd, &msg, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (n < 0) {
            if (errno == EINTR) continue;
            if (errno != EAGAIN && errno != EWOULDBLOCK) return false;
            pollfd p{fd, POLLOUT, 0};
            if (poll(&p, 1, kStallMillis) == 0) return false;
            continue;
        }
        size_t sent = static_cast<size_t>(n);
        while (first < 3 && sent >= iov[first].iov_len) {
            sent -= iov[first].iov_len;
            ++first;
        }
        if (first < 3) {
            iov[first].iov_base = static_cast<uint8_t*>(iov[first].iov_base) + sent;
            iov[first].iov_len -= sent;
        }
    }
    return true;
}

}  // namespace vyr_binder
