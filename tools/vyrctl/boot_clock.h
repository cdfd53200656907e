// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>

namespace vyrctl {

// CLOCK_BOOTTIME now, in nanoseconds: the clock of Event.boottime, so that a sample's age when
// vyrctl got it is the difference of the two.
int64_t BootTimeNs();

}  // namespace vyrctl
