// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <chrono>
#include <functional>

namespace vyr_test {

// Checks `condition` every millisecond until it holds (true) or `timeout` has passed (false):
// for state that nothing signals, such as another process's shared memory.
bool WaitUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout);

}  // namespace vyr_test
