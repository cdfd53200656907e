// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "deferred_join.h"

#include <utility>

namespace android {
namespace vyr {
namespace binder {

DeferredJoin::~DeferredJoin() {
    for (const std::unique_ptr<std::thread>& thread : threads_) {
        if (!thread->joinable()) continue;
        if (thread->get_id() == std::this_thread::get_id()) {
            thread->detach();
        } else {
            thread->join();
        }
    }
}

void DeferredJoin::Add(std::unique_ptr<std::thread> thread) {
    if (thread != nullptr) threads_.push_back(std::move(thread));
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
