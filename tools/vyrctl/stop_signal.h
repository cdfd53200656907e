// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// SIGINT and SIGTERM end a command cleanly: the handler only raises a flag, and each command's
// loop sees it within a short wait and disables and closes what it opened.

#include <chrono>

namespace vyrctl {

class StopSignal {
  public:
    // Installs the handlers without SA_RESTART, so that a blocking read returns EINTR.
    static void Install();
    static bool Requested();
    // Sleeps up to `duration`, returning early (true) once a stop was requested.
    static bool SleepFor(std::chrono::milliseconds duration);
};

}  // namespace vyrctl
