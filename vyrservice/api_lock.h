// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <chrono>
#include <mutex>

namespace android {
namespace vyr {
namespace binder {

// The service's API lock: a timed mutex, presented as a capability so that clang's thread-safety
// analysis can check what it guards (the C++ library annotates only std::mutex).
class CAPABILITY("mutex") ApiLock {
  public:
    bool TryLockFor(std::chrono::steady_clock::duration timeout) TRY_ACQUIRE(true);
    void Unlock() RELEASE();

  private:
    std::timed_mutex mutex_;
};

// Holds the API lock for a scope, if it was obtained in time; `owns_lock()` tells, as a
// std::unique_lock would. The analysis takes the lock as held: the caller checks owns_lock()
// fatally before it touches anything guarded.
class SCOPED_CAPABILITY ApiLockGuard {
  public:
    ApiLockGuard(ApiLock& lock, std::chrono::steady_clock::duration timeout) ACQUIRE(lock);
    ~ApiLockGuard() RELEASE();
    ApiLockGuard(const ApiLockGuard&) = delete;
    ApiLockGuard& operator=(const ApiLockGuard&) = delete;

    bool owns_lock() const { return owns_; }

  private:
    ApiLock& lock_;
    const bool owns_;
};

// Definitions apart from the declarations: GCC takes the annotations only on declarations.
inline bool ApiLock::TryLockFor(std::chrono::steady_clock::duration timeout) {
    return mutex_.try_lock_for(timeout);
}

inline void ApiLock::Unlock() {
    mutex_.unlock();
}

inline ApiLockGuard::ApiLockGuard(ApiLock& lock, std::chrono::steady_clock::duration timeout)
    : lock_(lock), owns_(lock.TryLockFor(timeout)) {}

inline ApiLockGuard::~ApiLockGuard() {
    if (owns_) lock_.Unlock();
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
