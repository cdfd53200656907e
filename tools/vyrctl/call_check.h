// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_auto_utils.h>

#include <cstdint>
#include <string>

#include "line_writer.h"

namespace vyrctl {

// Prints "error: <what>: ..." for a failed call and "error: <what> -> ..." for a refused one
// (negative result); true when the call succeeded.
bool CheckCall(const ndk::ScopedAStatus& status, int32_t result, const std::string& what,
               LineWriter* err);

}  // namespace vyrctl
