// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#define LOG_TAG "vyrservice"
#define ATRACE_TAG ATRACE_TAG_CAMERA

#include "batch_sender.h"

#include <android/binder_status.h>
#include <cutils/trace.h>

namespace android {
namespace vyr {
namespace binder {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;

namespace {

// Presence marker, size header, status, timestamp, value0, value1, data's length, boottime.
constexpr size_t kEventFixedBytes = 4 + 4 + 4 + 8 + 4 + 4 + 4 + 8;

void Send(IEventCallback& callback, std::vector<Event>::const_iterator begin,
          std::vector<Event>::const_iterator end, BatchResult* result) {
    if (result->dead || begin == end) return;
    const std::vector<Event> part(begin, end);
    ATRACE_BEGIN("vyr deliver batch");
    const ndk::ScopedAStatus status = callback.OnEventBatch(part);
    ATRACE_END();
    if (status.getStatus() == STATUS_DEAD_OBJECT) {
        result->dead = true;
    } else if (status.getStatus() != STATUS_FAILED_TRANSACTION) {
        // Delivered; what the client answered is its own business.
        result->delivered += part.size();
    } else if (part.size() == 1) {
        ++result->dropped;
    } else {
        const auto middle = begin + (end - begin) / 2;
        Send(callback, begin, middle, result);
        Send(callback, middle, end, result);
    }
}

}  // namespace

size_t BatchBytes(const Event& event) {
    return kEventFixedBytes + sizeof(float) * event.data.size();
}

BatchResult SendBatch(IEventCallback& callback, const std::vector<Event>& events) {
    BatchResult result;
    Send(callback, events.begin(), events.end(), &result);
    return result;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
