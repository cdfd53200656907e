// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The client processes of the floor benchmarks, each at the other end of a socket pair, and the
// waits of the service's threads that the benchmarks copy.

#include <chrono>
#include <cstddef>
#include <vector>

namespace vyr_bench {

// A range event's frame and the reply to it, as the service sends and receives them.
inline constexpr size_t kEventBytes = 340;
inline constexpr size_t kReplyBytes = 60;

// Forks `count` processes, each of which runs `serve` on its end of a socket pair of its own and
// must not return from it. The other ends, in order; empty if a pair could not be made.
std::vector<int> ForkPeers(int count, void (*serve)(int fd));
// Closes `fds`, which ends the peers' reads, and waits until every child process has ended.
void EndPeers(const std::vector<int>& fds);
// Sends the kEventBytes of `event` to the peer at `fd` and waits for its kReplyBytes into `reply`
// as the runtime does: poll, then read. False once the peer is gone.
bool RoundTrip(int fd, const char* event, char* reply);
// Sleeps until `deadline` on a timed condition-variable wait, the service's kind of wake-up.
void WaitUntil(std::chrono::steady_clock::time_point deadline);

}  // namespace vyr_bench
