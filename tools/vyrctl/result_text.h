// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>
#include <string>

namespace vyrctl {

// A short reading of a service result code, e.g. "-19 (no such device: sensor unavailable)".
std::string DescribeResult(int32_t result);

}  // namespace vyrctl
