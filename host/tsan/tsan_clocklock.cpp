// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Linked into every program of a TSan build (see the top-level CMakeLists.txt).
//
// ThreadSanitizer (GCC 12 and clang 14) does not intercept pthread_mutex_clocklock, which
// libstdc++'s std::timed_mutex uses for try_lock_for: it then sees the unlock of a mutex it never
// saw locked and misses the happens-before edges. Programs of a TSan build get this definition
// instead of glibc's; it waits through pthread_mutex_timedlock, which TSan does intercept.

#include <pthread.h>
#include <time.h>

#include <cerrno>
#include <cstdint>

namespace {

constexpr int64_t kNanosPerSecond = 1000000000;

int64_t Nanos(const timespec& t) {
    return static_cast<int64_t>(t.tv_sec) * kNanosPerSecond + t.tv_nsec;
}

}  // namespace

extern "C" int pthread_mutex_clocklock(pthread_mutex_t* mutex, clockid_t clock,
                                       const timespec* abstime) {
    if (abstime->tv_nsec < 0 || abstime->tv_nsec >= kNanosPerSecond) {
        return EINVAL;
    }
    timespec deadline = *abstime;
    if (clock != CLOCK_REALTIME) {
        // Same distance from now, measured on the realtime clock that timedlock waits on.
        timespec now_on_clock{}, now_real{};
        if (clock_gettime(clock, &now_on_clock) != 0) return EINVAL;
        clock_gettime(CLOCK_REALTIME, &now_real);
        const int64_t real = Nanos(now_real) + (Nanos(*abstime) - Nanos(now_on_clock));
        deadline.tv_sec = static_cast<time_t>(real / kNanosPerSecond);
        deadline.tv_nsec = static_cast<long>(real % kNanosPerSecond);
        if (deadline.tv_nsec < 0) {
            deadline.tv_nsec += kNanosPerSecond;
            --deadline.tv_sec;
        }
    }
    return pthread_mutex_timedlock(mutex, &deadline);
}

namespace {

// ThreadSanitizer starts a background thread of its own at the first thread creation and keeps
// it. Tests that count the process's threads take their baseline before starting any, so the
// sanitizer's thread is started here, before main, where it cannot skew a count.
[[maybe_unused]] const bool kBackgroundThreadStarted = [] {
    pthread_t thread;
    if (pthread_create(
            &thread, nullptr, [](void*) -> void* { return nullptr; }, nullptr) == 0) {
        pthread_join(thread, nullptr);
    }
    return true;
}();

}  // namespace
