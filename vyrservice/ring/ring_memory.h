// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/unique_fd.h>

#include <cstddef>
#include <string>

namespace android {
namespace vyr {
namespace binder {

// Shared memory that this process writes and clients may only read: on a device ashmem made
// read-only (what the NDK's ASharedMemory_create and ASharedMemory_setProt do; libandroid is not
// available to vendor code), on a host a sealed memfd reopened read-only.
class RingMemory {
  public:
    // Maps `size` zeroed bytes writable for this process; false with `*error` set on failure.
    bool Create(const char* name, size_t size, std::string* error);
    ~RingMemory();

    void* address() const { return address_; }
    size_t size() const { return size_; }
    // The descriptor that clients get a duplicate of: it can neither map the memory writable nor
    // resize it.
    int reader_fd() const { return reader_fd_.get(); }

  private:
    void* address_ = nullptr;
    size_t size_ = 0;
    base::unique_fd reader_fd_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
