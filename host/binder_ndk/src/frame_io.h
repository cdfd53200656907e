#pragma once

#include "wire.h"

#include <cstdint>
#include <vector>

namespace vyr_binder {

// A received frame, owning its bytes.
struct Frame {
    FrameHeader header;
    std::vector<uint8_t> data;
    std::vector<uint8_t> table;
};

enum class ReadResult { kFrame, kNoData, kClosed, kMalformed };

// Reads exactly one frame from a non-blocking stream socket, so the next frame stays in the
// socket for whichever thread reads next. With `wait` false, returns kNoData at once when
// nothing has arrived; a frame that stops arriving half-way counts as malformed.
ReadResult ReadFrame(int fd, bool wait, Frame* frame);

// Sends one frame whole; false when the peer is gone or stopped reading. Callers serialise
// sends per socket.
bool SendFrame(int fd, const FrameHeader& header, const uint8_t* data,
               const std::vector<uint8_t>& table);

}  // namespace vyr_binder
