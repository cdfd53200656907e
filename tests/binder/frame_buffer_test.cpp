// The receive buffer of a connection: what a peer's bytes may make it hold.

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstring>
#include <memory>
#include <thread>
#include <vector>

#include "frame_io.h"
#include "wire.h"

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

}  // namespace
