// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// `vyrctl demo-view`: samples both sensors and shows them live, optionally switching the torch
// on part way to show its effect on the light reading.

#include "connection.h"
#include "line_writer.h"
#include "options.h"

namespace vyrctl {

int RunDemoView(const Connection& connection, const DemoViewOptions& options, LineWriter* out,
                LineWriter* err);

}  // namespace vyrctl
