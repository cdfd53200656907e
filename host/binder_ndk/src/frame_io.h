#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "wire.h"

namespace vyr_binder {

// A received frame, owning its bytes.
struct Frame {
    FrameHeader header;
    std::vector<uint8_t> data;
    std::vector<uint8_t> table;
};

// The bytes read from one socket and not yet handled. Reads take whatever has arrived, so a
// small frame costs one read; a frame still arriving simply stays buffered.
class FrameBuffer {
  public:
    enum class Result { kFrame, kNoData, kClosed, kMalformed };

    // Reads until a whole frame is buffered: with `wait` blocking as long as it takes, without
    // it returning kNoData as soon as the socket has nothing more.
    Result Fill(int fd, bool wait);
    // Whether a whole frame is already buffered (kFrame), or the next header is bad.
    Result Check() const;
    // Moves the buffered frame out; Check must have given kFrame.
    void Take(Frame* frame);

  private:
    size_t Available() const { return end_ - begin_; }

    std::vector<uint8_t> buffer_;
    size_t begin_ = 0;
    size_t end_ = 0;
};

// Sends one frame whole; false when the peer is gone or stopped reading. Callers serialise
// sends per socket.
bool SendFrame(int fd, const FrameHeader& header, const uint8_t* data,
               const std::vector<uint8_t>& table);

}  // namespace vyr_binder
