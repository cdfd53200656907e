// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "display_state.h"

#include <algorithm>
#include <cstring>

namespace android {
namespace vyr {
namespace binder {

DisplayState JudgeDisplayState(const char* bytes, size_t count) {
    const size_t kept = std::min(count, kDisplayStateBufferSize - 1);
    DisplayState state;
    state.text.assign(bytes, strnlen(bytes, kept));
    state.lit =
        state.text.find("On") != std::string::npos || state.text.find("HBM") != std::string::npos;
    // Past the end when the text is all newlines (or empty), which keeps nothing.
    state.shown = state.text.substr(0, state.text.find_last_not_of('\n') + 1);
    return state;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
