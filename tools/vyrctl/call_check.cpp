// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "call_check.h"

#include "connection.h"
#include "result_text.h"

namespace vyrctl {

bool CheckCall(const ndk::ScopedAStatus& status, int32_t result, const std::string& what,
               LineWriter* err) {
    if (!status.isOk()) {
        err->WriteLine("error: " + what + ": " + DescribeStatus(status));
        return false;
    }
    if (result < 0) {
        err->WriteLine("error: " + what + " -> " + DescribeResult(result));
        return false;
    }
    return true;
}

}  // namespace vyrctl
