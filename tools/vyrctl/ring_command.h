// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// `vyrctl ring`: opens one sensor, enables it with EnableRing, maps the ring it hands over and
// prints each sample read from it in sequence, from the first one written after the start; on
// the way out (--seconds, Ctrl-C or SIGTERM) it disables and closes the handle.

#include "connection.h"
#include "line_writer.h"
#include "options.h"

namespace vyrctl {

// Exit status: 0 done, 1 a call was refused or failed, the ring could not be read or the
// service died.
int RunRing(const Connection& connection, const RingOptions& options, LineWriter* out,
            LineWriter* err);

}  // namespace vyrctl
