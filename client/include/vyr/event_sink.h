// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// An IEventCallback that hands each event to a function, on the binder thread that delivers it.

#include <aidl/android/vyr/BnEventCallback.h>

#include <functional>
#include <vector>

namespace vyr {

class EventSink : public aidl::android::vyr::BnEventCallback {
  public:
    using Sink = std::function<void(const aidl::android::vyr::Event&)>;

    explicit EventSink(Sink sink) : sink_(std::move(sink)) {}

    ndk::ScopedAStatus OnEvent(const aidl::android::vyr::Event& event) override;
    // Each event of a batch in turn, oldest first.
    ndk::ScopedAStatus OnEventBatch(const std::vector<aidl::android::vyr::Event>& events) override;
    ndk::ScopedAStatus OnFlushComplete(int32_t handle) override;

  private:
    const Sink sink_;
};

}  // namespace vyr
