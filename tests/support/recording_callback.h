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
    // The batch's events join the others in order; the batch's size is kept too.
    ndk::ScopedAStatus OnEventBatch(const std::vector<aidl::android::vyr::Event>& events) override;
    ndk::ScopedAStatus OnFlushComplete(int32_t handle) override;

    std::vector<aidl::android::vyr::Event> Events();
    size_t Count();
    // Waits until at least `count` events arrived; false on time-out.
    bool WaitForEvents(size_t count, std::chrono::milliseconds timeout);
    std::vector<size_t> BatchSizes();
    // Waits until at least `count` batches arrived; false on time-out.
    bool WaitForBatches(size_t count, std::chrono::milliseconds timeout);
    // How many events had arrived when each flush completion came, in order.
    std::vector<size_t> Flushes();
    // Waits until at least `count` flush completions arrived; false on time-out.
    bool WaitForFlushes(size_t count, std::chrono::milliseconds timeout);
    // While set, OnEvent records the event and then returns an error status.
    void SetFailing(bool failing) { failing_.store(failing); }
    // Runs inside OnEvent, on the caller's thread, after the event is recorded, with the number
    // of events so far: what a client does from its callback.
    void SetReaction(std::function<void(size_t count)> reaction);
    // The same inside OnEventBatch and OnFlushComplete, after what they carry is recorded.
    void SetBatchReaction(std::function<void()> reaction);
    void SetFlushReaction(std::function<void()> reaction);
    // Clears every reaction and waits until none is running: what a client does before it
    // disables or closes its handle from another thread, so that no nested call is left to wait
    // for the service while the service waits for the callback. False on time-out.
    bool StopReacting(std::chrono::milliseconds timeout);

  private:
    // Runs `reaction` (if any) counted as running, so that StopReacting can wait for it.
    template <typename Reaction, typename... Args>
    void React(const Reaction& reaction, Args... args);

    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<aidl::android::vyr::Event> events_;
    std::vector<size_t> batch_sizes_;
    std::vector<size_t> flushes_;
    std::atomic<bool> failing_{false};
    std::function<void(size_t)> reaction_;
    std::function<void()> batch_reaction_;
    std::function<void()> flush_reaction_;
    int reacting_ = 0;
};

}  // namespace vyr_test
