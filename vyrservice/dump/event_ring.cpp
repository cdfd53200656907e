// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "event_ring.h"

#include <utility>

namespace android {
namespace vyr {
namespace binder {

void EventRing::Record(std::string text) {
    Entry entry{std::chrono::steady_clock::now(), std::move(text)};
    std::lock_guard<std::mutex> lock(mutex_);
    if (entries_.size() == kCapacity) entries_.pop_front();
    entries_.push_back(std::move(entry));
}

std::vector<EventRing::Entry> EventRing::Snapshot() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return std::vector<Entry>(entries_.begin(), entries_.end());
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
