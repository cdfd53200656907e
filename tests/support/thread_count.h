// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Thread counting through /proc, for tests that check that nothing leaves a thread behind.

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <map>
#include <string>

namespace vyr_test {

// Number of threads of this process, not counting those that are already exiting.
size_t ThreadCount();
// The thread count once a thread started and joined here has left for good, as a baseline:
// sanitizer runtimes start a helper thread at the first thread creation, and under qemu-user a
// joined thread's task lingers for a moment after the join.
size_t SettledThreadCount();
// The names of this process's threads, for failure messages.
std::string ThreadNames();
// Waits until the process has `count` threads; false on time-out.
bool WaitForThreadCount(size_t count, std::chrono::milliseconds timeout);
// Waits until the process has fewer than `count` threads; false on time-out.
bool WaitForThreadCountBelow(size_t count, std::chrono::milliseconds timeout);
// How often each live thread of this process whose name starts with `prefix` has gone to sleep
// so far, by thread id.
std::map<pid_t, unsigned long> VoluntarySwitches(const std::string& prefix = "");
// Waits until thread `tid` of this process sleeps (state S); false on time-out.
bool WaitUntilAsleep(pid_t tid, std::chrono::milliseconds timeout);

}  // namespace vyr_test
