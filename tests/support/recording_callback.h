#pragma once

// An IEventCallback that keeps every event it receives and can be told to report failure.

#include <aidl/android/vyr/BnEventCallback.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
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

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<aidl::android::vyr::Event> events_;
    std::atomic<bool> failing_{false};
};

}  // namespace vyr_test
