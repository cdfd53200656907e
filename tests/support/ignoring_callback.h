// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/BnEventCallback.h>

#include <vector>

namespace vyr_test {

// An IEventCallback that takes every call and keeps nothing: for a client whose events do not
// matter, only that it has a callback.
class IgnoringCallback : public aidl::android::vyr::BnEventCallback {
  public:
    ndk::ScopedAStatus OnEvent(const aidl::android::vyr::Event&) override {
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus OnEventBatch(const std::vector<aidl::android::vyr::Event>&) override {
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus OnFlushComplete(int32_t) override { return ndk::ScopedAStatus::ok(); }
};

}  // namespace vyr_test
