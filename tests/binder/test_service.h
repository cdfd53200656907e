// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/BnEventCallback.h>
#include <aidl/android/vyr/BnVYRService.h>

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace vyr_test::binder {

using aidl::android::vyr::BnEventCallback;
using aidl::android::vyr::BnVYRService;
using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;
using aidl::android::vyr::IVYRService;

// A small IVYRService whose results tell what it received, for round trips through the runtime.
// Open(kQueryTorch) returns the last torch state; Open(kTorchCalleeLater) returns at once and
// 100 ms later looks up kCalleeName and sets its torch state to kCalleeTorch; Close(n > 0)
// delivers n events to the stored callback from another thread; EnableLowPower(kBlockForever,
// ...) never returns. EnableRing(handle >= 0, period) hands back a file named kRingName that
// holds RingText(handle, period); for a negative handle, -38 and no file, as the service answers
// an unknown handle. Its dump writes "dump:" and its arguments on one line; with the argument
// "big", 4 MiB after that, and with "slow", a line every 10 ms for 10 s.
class TestService : public BnVYRService {
  public:
    static constexpr int32_t kQueryTorch = -100;
    // Open(kQueryTorchCaller): the calling pid SetTorchLightState last saw.
    static constexpr int32_t kQueryTorchCaller = -102;
    static constexpr int32_t kTorchCalleeLater = -101;
    static constexpr const char* kCalleeName = "vyr.callee";
    static constexpr int32_t kCalleeTorch = 7;
    static constexpr int32_t kBlockForever = 999;
    static constexpr const char* kRingName = "vyr.test.ring";
    static std::string RingText(int32_t handle, int32_t period);

    ~TestService() override;
    ndk::ScopedAStatus Open(int32_t mode, int32_t* result) override;
    ndk::ScopedAStatus Close(int32_t handle) override;
    ndk::ScopedAStatus Enable(int32_t handle, int32_t period, int32_t* result) override;
    ndk::ScopedAStatus Disable(int32_t handle) override;
    ndk::ScopedAStatus SetCallback(int32_t handle, const std::shared_ptr<IEventCallback>& callback,
                                   int32_t* result) override;
    ndk::ScopedAStatus EnableLowPower(int32_t handle, bool enable, int32_t* result) override;
    ndk::ScopedAStatus PollOnce(int32_t handle, Event* event, int32_t* result) override;
    ndk::ScopedAStatus ConfigureParameters(int32_t handle, const std::vector<int32_t>& params,
                                           int32_t* result) override;
    ndk::ScopedAStatus SetTorchLightState(int32_t state) override;
    ndk::ScopedAStatus EnableOnSample(int32_t handle, int32_t period, int32_t max_report_latency,
                                      int32_t* result) override;
    ndk::ScopedAStatus Flush(int32_t handle, int32_t* result) override;
    ndk::ScopedAStatus EnableRing(int32_t handle, int32_t period, ndk::ScopedFileDescriptor* ring,
                                  int32_t* result) override;
    binder_status_t dump(int fd, const char** args, uint32_t num_args) override;

    std::shared_ptr<IEventCallback> callback();
    int32_t last_torch_state() const { return torch_state_.load(); }

  private:
    std::mutex mutex_;
    std::shared_ptr<IEventCallback> callback_;
    std::vector<std::thread> senders_;
    std::atomic<int32_t> torch_state_{-1};
    std::atomic<int32_t> torch_caller_{-1};
};

// Records the events it receives.
class RecordingCallback : public BnEventCallback {
  public:
    ndk::ScopedAStatus OnEvent(const Event& event) override;
    ndk::ScopedAStatus OnEventBatch(const std::vector<Event>& events) override;
    ndk::ScopedAStatus OnFlushComplete(int32_t handle) override;
    // Waits up to 10 s for `count` events.
    bool WaitForEvents(size_t count);
    std::vector<Event> events();

  private:
    std::mutex mutex_;
    std::condition_variable cv_;
    std::vector<Event> events_;
};

// The event PollOnce(handle) returns.
Event MakeEvent(int32_t handle);

}  // namespace vyr_test::binder
