// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The life of one client process that the soak kills somewhere along the way. It reports each
// step it has reached on stdout, one word a line, so that the soak can kill it at that step.

#include <string>

namespace vyr_bench::abuse {

// Steps, in the order a client reaches them.
constexpr const char* kSteps[] = {"started", "opened", "callback", "enabled", "polling"};

// Runs in the client process: opens `mode` (retrying while the table is full), then with
// `with_callback` sets a callback, enables at 20 ms, and polls until it is killed. Returns only
// on failure.
int RunAbusiveClient(int mode, bool with_callback);

}  // namespace vyr_bench::abuse
