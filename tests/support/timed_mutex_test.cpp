// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// std::timed_mutex as the service's API lock uses it. In TSan builds its lock goes through the
// host/tsan stand-in for pthread_mutex_clocklock; these tests check that stand-in's deadlines and
// that TSan sees the lock (a missed lock shows as a reported race on the counter).

#include <gtest/gtest.h>

#include <chrono>
#include <mutex>
#include <thread>

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

namespace vyr_test {
namespace {

TEST(TimedMutexTest, TryLockForGuardsSharedData) {
    std::timed_mutex mutex;
    int counter = 0;
    auto work = [&] {
        for (int i = 0; i < 2000; ++i) {
            std::unique_lock<std::timed_mutex> lock(mutex, 10s);
            ASSERT_TRUE(lock.owns_lock());
            ++counter;
        }
    };
    std::thread other(work);
    work();
    other.join();
    EXPECT_EQ(counter, 4000);
}

TEST(TimedMutexTest, TryLockForTimesOutWhileHeld) {
    std::timed_mutex mutex;
    std::unique_lock<std::timed_mutex> held(mutex);
    bool locked = true;
    Clock::duration waited{};
    std::thread other([&] {
        const auto start = Clock::now();
        locked = mutex.try_lock_for(200ms);
        waited = Clock::now() - start;
    });
    other.join();
    EXPECT_FALSE(locked);
    EXPECT_GE(waited, 200ms);
    EXPECT_LT(waited, 10s);
}

TEST(TimedMutexTest, TryLockForGetsAMutexReleasedInTime) {
    std::timed_mutex mutex;
    std::unique_lock<std::timed_mutex> held(mutex);
    bool locked = false;
    std::thread other([&] {
        locked = mutex.try_lock_for(10s);
        if (locked) mutex.unlock();
    });
    std::this_thread::sleep_for(50ms);
    held.unlock();
    other.join();
    EXPECT_TRUE(locked);
}

TEST(TimedMutexTest, TryLockUntilAPastDeadlineStillTakesAFreeMutex) {
    std::timed_mutex mutex;
    EXPECT_TRUE(mutex.try_lock_until(Clock::now() - 1s));
    mutex.unlock();
}

}  // namespace
}  // namespace vyr_test
