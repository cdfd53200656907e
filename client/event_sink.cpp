// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "vyr/event_sink.h"

namespace vyr {

ndk::ScopedAStatus EventSink::OnEvent(const aidl::android::vyr::Event& event) {
    sink_(event);
    return ndk::ScopedAStatus::ok();
}

}  // namespace vyr
