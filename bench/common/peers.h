// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The client processes of the floor benchmarks, each at the other end of a socket pair.

#include <vector>

namespace vyr_bench {

// Forks `count` processes, each of which runs `serve` on its end of a socket pair of its own and
// must not return from it. The other ends, in order; empty if a pair could not be made.
std::vector<int> ForkPeers(int count, void (*serve)(int fd));
// Closes `fds`, which ends the peers' reads, and waits until every child process has ended.
void EndPeers(const std::vector<int>& fds);

}  // namespace vyr_bench
