#pragma once

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

enum class ReadResult { kFrame, kNoData, kClosed, kMalformed };

// Reads exactly one frame from a stream socket, so the next frame stays in the socket for
// whichever thread reads next. With `wait`, blocks until a whole frame is there. Without, returns
// kNoData at once when nothing has arrived, and a frame that stops arriving half-way counts as
// malformed, so a runtime thread is never held by one peer.
ReadResult ReadFrame(int fd, bool wait, Frame* frame);

// Sends one frame whole; false when the peer is gone or stopped reading. Callers serialise
// sends per socket.
bool SendFrame(int fd, const FrameHeader& header, const uint8_t* data,
               const std::vector<uint8_t>& table);

}  // namespace vyr_binder
