// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "event_parcel.h"

#include <android/binder_auto_utils.h>
#include <android/binder_parcel.h>
#include <android/binder_parcel_utils.h>

namespace vyr_test {

size_t EventsParcelBytes(const std::vector<aidl::android::vyr::Event>& events) {
    ndk::ScopedAParcel parcel(AParcel_create());
    if (ndk::AParcel_writeVector(parcel.get(), events) != STATUS_OK) return 0;
    return static_cast<size_t>(AParcel_getDataSize(parcel.get()));
}

}  // namespace vyr_test
