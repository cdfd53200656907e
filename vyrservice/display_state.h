// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstddef>
#include <string>

namespace android {
namespace vyr {
namespace binder {

// What the display monitor makes of one read of the panel's state attribute.
struct DisplayState {
    // The text as read, cut at the monitor's buffer and at the first NUL (what the logs show).
    std::string text;
    // The panel is lit: the text names "On" or "HBM".
    bool lit = false;
    // The text without its trailing newlines, for the dump and the recent events.
    std::string shown;
};

// The monitor reads into a buffer of this many bytes and keeps the last one for the terminator.
constexpr size_t kDisplayStateBufferSize = 50;

// Judges `count` bytes read from the attribute; no I/O, so tests call it without a panel.
DisplayState JudgeDisplayState(const char* bytes, size_t count);

}  // namespace binder
}  // namespace vyr
}  // namespace android
