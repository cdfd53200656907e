// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_parcel.h>

#include <cstdint>
#include <string>
#include <vector>

namespace vyr_binder {

// A dump request's arguments in its parcel, after its output descriptor: a count, then each as
// a string.
constexpr uint32_t kMaxDumpArguments = 256;

binder_status_t WriteDumpArguments(AParcel* parcel, const char** args, uint32_t count);
// False when the parcel does not hold such a list.
bool ReadDumpArguments(const AParcel* parcel, std::vector<std::string>* args);

}  // namespace vyr_binder
