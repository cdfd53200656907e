// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// `vyrctl stream`: opens one sensor, prints every event, and disables and closes it on the way
// out, also after Ctrl-C or SIGTERM.

#include "connection.h"
#include "line_writer.h"
#include "options.h"

namespace vyrctl {

// Exit status: 0 done, 1 a call was refused or failed.
int RunStream(const Connection& connection, const StreamOptions& options, LineWriter* out,
              LineWriter* err);

}  // namespace vyrctl
