// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/Event.h>
#include <android/binder_auto_utils.h>
#include <vyr/sample_ring_layout.h>

#include <cstdint>
#include <memory>
#include <string>

#include "ring_memory.h"

namespace android {
namespace vyr {
namespace binder {

// The sample ring of one mode (interface version 3), laid out as vyr/sample_ring_layout.h says:
// the service writes it, clients map a read-only descriptor of it.
class SampleRing {
  public:
    // A ring of `capacity` records for `mode`, none written yet; null with `*error` set when its
    // memory cannot be made.
    static std::unique_ptr<SampleRing> Create(int32_t mode, uint32_t capacity, std::string* error);

    // Stores `event` as the next record and wakes one reader waiting for one, which wakes the
    // others. Never waits: a reader that is slow, asleep or gone costs nothing here. One thread at
    // a time.
    void Write(const aidl::android::vyr::Event& event);
    // A descriptor of the ring for a client, read-only; -1 with errno set when none can be made.
    ndk::ScopedFileDescriptor ReaderFd() const;
    // The seq of the last record written, 0 before the first.
    uint64_t last_seq() const { return vyr_ring_last_seq(header_); }

  private:
    SampleRing() = default;

    RingMemory memory_;
    vyr_ring_header* header_ = nullptr;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
