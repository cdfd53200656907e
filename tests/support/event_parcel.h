// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/Event.h>

#include <cstddef>
#include <vector>

namespace vyr_test {

// What `events` take in a parcel, as OnEventBatch sends them.
size_t EventsParcelBytes(const std::vector<aidl::android::vyr::Event>& events);

}  // namespace vyr_test
