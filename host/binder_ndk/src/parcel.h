// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_auto_utils.h>
#include <android/binder_parcel.h>

#include <cstddef>
#include <cstdint>
#include <vector>

namespace vyr_binder {

// A binder written into a parcel: where its slot is in the data, and the reference it holds.
struct ParcelObject {
    uint32_t offset;
    ndk::SpAIBinder binder;
};

// Writes past this size fail with STATUS_NO_MEMORY; what may cross a process is far smaller.
constexpr size_t kMaxParcelBytes = 64u << 20;
// Room reserved up front in the parcels of a call, enough for most, so they grow once at most.
constexpr size_t kSmallParcelBytes = 256;

}  // namespace vyr_binder

struct AParcel {
    std::vector<uint8_t> data;
    // Reads move the position of a const parcel, as on the platform.
    mutable size_t pos = 0;
    std::vector<vyr_binder::ParcelObject> objects;
    // Duplicates of the descriptors written into the parcel, which it owns and closes; the data
    // holds each one's index here.
    std::vector<ndk::ScopedFileDescriptor> fds;
    // The binder a transaction parcel was prepared for; null for replies and free parcels.
    ndk::SpAIBinder target;

    // Both pad to a multiple of four bytes.
    binder_status_t Write(const void* bytes, size_t size);
    binder_status_t Read(void* bytes, size_t size) const;
    // Bytes from the position to the end of the data.
    size_t Remaining() const { return pos < data.size() ? data.size() - pos : 0; }
    void Clear();
};
