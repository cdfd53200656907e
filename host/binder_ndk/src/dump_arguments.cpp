// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "dump_arguments.h"

#include <android/binder_parcel_utils.h>

namespace vyr_binder {

binder_status_t WriteDumpArguments(AParcel* parcel, const char** args, uint32_t count) {
    if (count > kMaxDumpArguments || (count > 0 && args == nullptr)) return STATUS_BAD_VALUE;
    binder_status_t status = AParcel_writeInt32(parcel, static_cast<int32_t>(count));
    for (uint32_t i = 0; i < count && status == STATUS_OK; ++i) {
        if (args[i] == nullptr) return STATUS_UNEXPECTED_NULL;
        status = ndk::AParcel_writeString(parcel, std::string(args[i]));
    }
    return status;
}

bool ReadDumpArguments(const AParcel* parcel, std::vector<std::string>* args) {
    int32_t count = 0;
    if (AParcel_readInt32(parcel, &count) != STATUS_OK || count < 0 ||
        static_cast<uint32_t>(count) > kMaxDumpArguments) {
        return false;
    }
    args->resize(static_cast<size_t>(count));
    for (std::string& arg : *args) {
        if (ndk::AParcel_readString(parcel, &arg) != STATUS_OK) return false;
    }
    return true;
}

}  // namespace vyr_binder
