// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Rendering of the live demo view: a two-column panel for terminals, one plain line per
// refresh for logs.

#include <optional>
#include <string>
#include <vector>

#include "event_format.h"

namespace vyrctl {

struct DemoState {
    double elapsed_s = 0;
    double total_s = 0;
    std::optional<double> torch_at_s;
    bool torch_on = false;
    // Empty when the sensor is in use; otherwise why it is not (e.g. "unavailable (-19)").
    std::string range_problem;
    std::string als_problem;
    std::optional<RangeFrame> range;
    std::optional<AlsReading> als;
    int range_events = 0;
    int als_events = 0;
};

class DemoScreen {
  public:
    // The whole panel, one string per terminal line.
    static std::vector<std::string> Panel(const DemoState& state);
    // One self-contained line for non-terminal output.
    static std::string PlainLine(const DemoState& state);
};

}  // namespace vyrctl
