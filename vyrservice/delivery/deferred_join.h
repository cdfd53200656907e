// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <memory>
#include <thread>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

// The delivery threads of clients enabled on sample, stopped under the API lock and joined once
// it is released: such a thread may be inside a callback that calls the service back, is slow,
// or never answers, and only its own client's call may wait for it. Declared before the lock's
// guard in a method, so that it is destroyed, and joins, after the guard has unlocked.
class DeferredJoin {
  public:
    DeferredJoin() = default;
    // Joins every thread handed over; one that is the calling thread itself (a nested call from
    // its own callback) is let go instead, and ends when that callback returns.
    ~DeferredJoin();
    DeferredJoin(const DeferredJoin&) = delete;
    DeferredJoin& operator=(const DeferredJoin&) = delete;

    void Add(std::unique_ptr<std::thread> thread);

  private:
    std::vector<std::unique_ptr<std::thread>> threads_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
