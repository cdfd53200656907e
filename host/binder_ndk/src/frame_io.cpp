#include "frame_io.h"

#include <errno.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/uio.h>

#include <cstring>

namespace vyr_binder {
namespace {

// How long a peer may keep us from sending a frame before the connection counts as broken.
constexpr int kSendStallMillis = 10000;
constexpr size_t kReadChunk = 16 * 1024;

size_t FrameSize(const FrameHeader& header) {
    return sizeof(FrameHeader) + header.data_size + header.table_size;
}

}  // namespace

FrameBuffer::Result FrameBuffer::Check() const {
    if (Available() < sizeof(FrameHeader)) return Result::kNoData;
    FrameHeader header;
    std::memcpy(&header, buffer_.data() + begin_, sizeof(header));
    if (!ValidateHeader(header)) return Result::kMalformed;
    return Available() >= FrameSize(header) ? Result::kFrame : Result::kNoData;
}

FrameBuffer::Result FrameBuffer::Fill(int fd, bool wait) {
    for (;;) {
        Result result = Check();
        if (result != Result::kNoData) return result;
        // Room for the whole frame once its header is known (checked, so at most ~2 MiB).
        size_t needed = kReadChunk;
        if (Available() >= sizeof(FrameHeader)) {
            FrameHeader header;
            std::memcpy(&header, buffer_.data() + begin_, sizeof(header));
            needed = FrameSize(header) > needed ? FrameSize(header) : needed;
        }
        if (begin_ > 0 && buffer_.size() - begin_ < needed) {
            std::memmove(buffer_.data(), buffer_.data() + begin_, Available());
            end_ -= begin_;
            begin_ = 0;
        }
        if (buffer_.size() - begin_ < needed) buffer_.resize(begin_ + needed);
        ssize_t n = recv(fd, buffer_.data() + end_, buffer_.size() - end_, wait ? 0 : MSG_DONTWAIT);
        if (n > 0) {
            end_ += static_cast<size_t>(n);
            continue;
        }
        if (n == 0) return Result::kClosed;
        if (errno == EINTR) continue;
        if (!wait && (errno == EAGAIN || errno == EWOULDBLOCK)) return Result::kNoData;
        return Result::kClosed;
    }
}

void FrameBuffer::Take(Frame* frame) {
    std::memcpy(&frame->header, buffer_.data() + begin_, sizeof(FrameHeader));
    const uint8_t* data = buffer_.data() + begin_ + sizeof(FrameHeader);
    frame->data.assign(data, data + frame->header.data_size);
    const uint8_t* table = data + frame->header.data_size;
    frame->table.assign(table, table + frame->header.table_size);
    begin_ += FrameSize(frame->header);
    if (begin_ == end_) {
        begin_ = end_ = 0;
        // Give back the room a large frame took.
        if (buffer_.size() > 4 * kReadChunk) std::vector<uint8_t>(kReadChunk).swap(buffer_);
    }
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
            if (poll(&p, 1, kSendStallMillis) == 0) return false;
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
