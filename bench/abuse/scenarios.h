// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The abuse scenarios, each against a fresh service process. Each prints its figures and
// returns 0 when the service came through (no crash, nothing left running), 1 otherwise.

#include <string>

namespace vyr_bench::abuse {

struct Options {
    std::string service_binary;
    // This program, started again as the abusive client processes.
    std::string self;
    int clients = 500;
    int honest = 10;
    int parallel = 6;
    int connections = 200;
    unsigned seed = 1;
};

// Clients killed at random steps of their life while honest clients keep calling.
int RunSoak(const Options& options);
// Connections that each send only a header announcing a maximum-size frame, in two rounds.
int RunHeaders(const Options& options);
// Honest calls with and without a peer that sends calls and never reads the replies.
int RunStalled(const Options& options);

}  // namespace vyr_bench::abuse
