#pragma once

// Thread counting through /proc, for tests that check that nothing leaves a thread behind.

#include <chrono>
#include <cstddef>
#include <string>

namespace vyr_test {

// Number of threads of this process, not counting those that are already exiting.
size_t ThreadCount();
// The names of this process's threads, for failure messages.
std::string ThreadNames();
// Waits until the process has `count` threads; false on time-out.
bool WaitForThreadCount(size_t count, std::chrono::milliseconds timeout);

}  // namespace vyr_test
