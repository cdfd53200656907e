// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "vyr/event_sink.h"

namespace vyr {

ndk::ScopedAStatus EventSink::OnEvent(const aidl::android::vyr::Event& event) {
    sink_(event);
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus EventSink::OnEventBatch(const std::vector<aidl::android::vyr::Event>& events) {
    for (const auto& event : events) sink_(event);
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus EventSink::OnFlushComplete(int32_t) {
    return ndk::ScopedAStatus::ok();
}

}  // namespace vyr
