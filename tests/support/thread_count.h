#pragma once

// Thread counting through /proc, for tests that check that nothing leaves a thread behind.

#include <chrono>
#include <cstddef>

namespace vyr_test {

// Number of threads of this process.
size_t ThreadCount();
// Waits until the process has `count` threads; false on time-out.
bool WaitForThreadCount(size_t count, std::chrono::milliseconds timeout);

}  // namespace vyr_test
