// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/Event.h>

#include "ambient_light_sensor.h"
#include "ubk/range_sensor.h"

namespace android {
namespace vyr {
namespace binder {

// Fill `event` from one ambient-light reading: status, timestamp, value0/value1 and five floats
// in the order r0, r1, r2, r4, r3. Any earlier `data` is replaced.
void ConvertAlsResult(const ALSResult& result, aidl::android::vyr::Event* event);

// Fill `event` from one range frame: timestamp, status/value0/value1 zero, and 10 header floats
// followed by 11 floats per reported zone. Any earlier `data` is replaced.
void ConvertRangingData(const MultiRangingData& data, aidl::android::vyr::Event* event);

}  // namespace binder
}  // namespace vyr
}  // namespace android
