#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "wire.h"

namespace vyr_binder {

// A received frame; data and table point into the reader's buffer until the next Read.
struct FrameView {
    FrameHeader header;
    const uint8_t* data;
    const uint8_t* table;
};

// Reads whole frames from a stream socket, buffering so that a small frame costs one read.
class FrameReader {
  public:
    enum class Result { kFrame, kClosed, kMalformed };

    explicit FrameReader(int fd) : fd_(fd) {}
    Result Read(FrameView* frame);

  private:
    // False on end of stream or error.
    bool Fill(size_t needed);

    const int fd_;
    std::vector<uint8_t> buffer_;
    size_t begin_ = 0;
    size_t end_ = 0;
};

// Sends one frame whole; false when the peer is gone. Callers serialise sends per socket.
bool SendFrame(int fd, const FrameHeader& header, const uint8_t* data,
               const std::vector<uint8_t>& table);

}  // namespace vyr_binder
