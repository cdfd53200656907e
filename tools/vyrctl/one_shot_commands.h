// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Commands that make one request and leave: `configure`, `torch` and `dump`.

#include <string>
#include <vector>

#include "connection.h"
#include "line_writer.h"

namespace vyrctl {

// Opens a range handle, sends the eleven values, prints the result and closes the handle.
int RunConfigure(const Connection& connection, const std::vector<int32_t>& values, LineWriter* out,
                 LineWriter* err);
int RunTorch(const Connection& connection, int32_t state, LineWriter* out, LineWriter* err);
// Has the service write its dump to this program's standard output.
int RunDump(const Connection& connection, const std::vector<std::string>& args, LineWriter* err);

}  // namespace vyrctl
