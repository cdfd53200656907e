// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// An IEventCallback that keeps every event it receives and can be told to report failure.

#include <aidl/android/vyr/BnEventCallback.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <vector>

namespace vyr_test {

class RecordingCallback : public aidl::android::vyr::BnEventCallback {
  public:
    ndk::ScopedAStatus OnEvent(const aidl::android::vyr::Event& event) override;

    std::vector<aidl::android::vyr::Event> Events();
    size_t Count();
    // Waits until at least `count` events arrived; false on time-out.
    bool WaitForEvents(size_t count, std::chrono::milliseconds timeout);
    // While set, OnEvent records the event and then returns an error status.
    void SetFailing(bool failing) { failing_.store(failing); }
    // Runs inside OnEvent, on the caller's thread, after the event is recorded, with the number
    // of events so far: what a client does from its callback.
    void SetReaction(std::function<void(size_t count)> reaction);

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<aidl::android::vyr::Event> events_;
    std::atomic<bool> failing_{false};
    std::function<void(size_t)> reaction_;
};

}  // namespace vyr_test
