// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/Event.h>
#include <aidl/android/vyr/IEventCallback.h>

#include <cstddef>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

// The most that a batch may take in a parcel before it is handed over, whatever its latency:
// one eighth of the transaction buffer of the receiving process (1 MiB less 8 KiB), which every
// call in flight to that process shares, so that a batch still fits beside the process's other
// traffic. A four-zone range event takes about 260 bytes, so a batch holds about 500 of them.
constexpr size_t kBatchBudgetBytes = 128 * 1024;

// What a batch's parcel takes besides its events: the array's length.
constexpr size_t kBatchHeaderBytes = 4;
// What an event takes in a batch's parcel: the element's presence marker, its size header and
// fixed fields, and its data.
size_t BatchBytes(const aidl::android::vyr::Event& event);

struct BatchResult {
    size_t delivered = 0;
    // Events that could not be sent, not even alone.
    size_t dropped = 0;
    // The client's process is gone: nothing more can reach it.
    bool dead = false;
};

// Hands `events` to the client through OnEventBatch. A batch that the client's transaction buffer
// refuses (FAILED_TRANSACTION: the buffer is shared with everything else in flight to that
// process) is split in halves, each sent again the same way; an event refused alone is dropped.
BatchResult SendBatch(aidl::android::vyr::IEventCallback& callback,
                      const std::vector<aidl::android::vyr::Event>& events);

}  // namespace binder
}  // namespace vyr
}  // namespace android
