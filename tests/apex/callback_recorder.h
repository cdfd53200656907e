// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <apex_update_listener.h>

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <set>
#include <thread>
#include <vector>

namespace vyr_test::apex {

// Collects the listener's callbacks, which arrive on the listener thread.
class CallbackRecorder {
  public:
    struct Call {
        std::set<ApexUpdateListener::Info> old_info;
        std::set<ApexUpdateListener::Info> new_info;
        std::thread::id thread;
    };

    // The recorder must outlive every listener holding this callback.
    ApexUpdateListener::Callback AsCallback();

    // Waits until at least `count` calls arrived; false on time-out.
    bool WaitForCalls(size_t count, std::chrono::milliseconds timeout);
    std::vector<Call> Calls() const;

  private:
    mutable std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<Call> calls_;
};

}  // namespace vyr_test::apex
