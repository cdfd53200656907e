#pragma once

// An IEventCallback that hands each event to a function; it runs on a binder thread.

#include <aidl/android/vyr/BnEventCallback.h>

#include <functional>

namespace vyrctl {

class ForwardingCallback : public aidl::android::vyr::BnEventCallback {
  public:
    using Sink = std::function<void(const aidl::android::vyr::Event&)>;

    explicit ForwardingCallback(Sink sink) : sink_(std::move(sink)) {}

    ndk::ScopedAStatus OnEvent(const aidl::android::vyr::Event& event) override;

  private:
    const Sink sink_;
};

}  // namespace vyrctl
