// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "vyr/ring_sample.h"

#include <algorithm>

namespace vyr {

aidl::android::vyr::Event RingSample::ToEvent() const {
    aidl::android::vyr::Event event;
    event.status = status;
    event.timestamp = timestamp;
    event.value0 = value0;
    event.value1 = value1;
    event.data.assign(data.begin(), data.begin() + std::min<size_t>(data_count, data.size()));
    event.boottime = boottime_ns;
    return event;
}

}  // namespace vyr
