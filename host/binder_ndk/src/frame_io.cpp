#include "frame_io.h"

#include <errno.h>
#include <sys/socket.h>
#include <sys/uio.h>

#include <cstring>

namespace vyr_binder {
namespace {

constexpr size_t kReadChunk = 64 * 1024;

}  // namespace

bool FrameReader::Fill(size_t needed) {
    if (end_ - begin_ >= needed) return true;
    if (begin_ > 0) {
        std::memmove(buffer_.data(), buffer_.data() + begin_, end_ - begin_);
        end_ -= begin_;
        begin_ = 0;
    }
    if (buffer_.size() < needed || buffer_.size() < kReadChunk) {
        buffer_.resize(needed > kReadChunk ? needed : kReadChunk);
    }
    while (end_ < needed) {
        ssize_t n = recv(fd_, buffer_.data() + end_, buffer_.size() - end_, 0);
        if (n > 0) {
            end_ += static_cast<size_t>(n);
        } else if (n == 0 || errno != EINTR) {
            return false;
        }
    }
    return true;
}

FrameReader::Result FrameReader::Read(FrameView* frame) {
    // A frame consumed by the previous call is dropped only now, so its views stayed valid.
    if (!Fill(sizeof(FrameHeader))) return Result::kClosed;
    std::memcpy(&frame->header, buffer_.data() + begin_, sizeof(FrameHeader));
    if (!ValidateHeader(frame->header)) return Result::kMalformed;
    size_t body = size_t{frame->header.data_size} + frame->header.table_size;
    if (!Fill(sizeof(FrameHeader) + body)) return Result::kClosed;
    frame->data = buffer_.data() + begin_ + sizeof(FrameHeader);
    frame->table = frame->data + frame->header.data_size;
    begin_ += sizeof(FrameHeader) + body;
    return Result::kFrame;
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
        ssize_t n = sendmsg(fd, &msg, MSG_NOSIGNAL);
        if (n < 0) {
            if (errno == EINTR) continue;
            return false;
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
