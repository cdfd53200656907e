// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "result_text.h"

namespace vyrctl {

std::string DescribeResult(int32_t result) {
    const char* meaning = nullptr;
    switch (result) {
        case -1:
            meaning = "refused: too many clients, or not allowed while enabled";
            break;
        case -17:
            meaning = "already enabled";
            break;
        case -19:
            meaning = "sensor unavailable";
            break;
        case -22:
            meaning = "invalid argument or handle";
            break;
        case -38:
            meaning = "unknown handle";
            break;
        case -61:
            meaning = "no new sample";
            break;
        default:
            break;
    }
    std::string text = std::to_string(result);
    if (meaning != nullptr) text += std::string(" (") + meaning + ")";
    return text;
}

}  // namespace vyrctl
