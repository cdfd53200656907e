// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <mutex>

namespace vyr_binder {

// std::unique_lock as clang's thread-safety analysis can follow it (the C++ library does not
// annotate it): a scoped capability that may be unlocked and locked again, and handed to a
// condition variable.
class SCOPED_CAPABILITY UniqueLock {
  public:
    explicit UniqueLock(std::mutex& mutex) ACQUIRE(mutex) : lock_(mutex) {}
    ~UniqueLock() RELEASE() {}
    UniqueLock(const UniqueLock&) = delete;
    UniqueLock& operator=(const UniqueLock&) = delete;

    void lock() ACQUIRE() { lock_.lock(); }
    void unlock() RELEASE() { lock_.unlock(); }
    // For condition variables, which give the mutex back before they return.
    std::unique_lock<std::mutex>& native() { return lock_; }

  private:
    std::unique_lock<std::mutex> lock_;
};

}  // namespace vyr_binder
