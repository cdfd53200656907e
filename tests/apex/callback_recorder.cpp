// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "callback_recorder.h"

namespace vyr_test::apex {

ApexUpdateListener::Callback CallbackRecorder::AsCallback() {
    return [this](const std::set<ApexUpdateListener::Info>& old_info,
                  const std::set<ApexUpdateListener::Info>& new_info) {
        std::lock_guard<std::mutex> lock(mutex_);
        calls_.push_back(Call{old_info, new_info, std::this_thread::get_id()});
        changed_.notify_all();
    };
}

bool CallbackRecorder::WaitForCalls(size_t count, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, timeout, [&] { return calls_.size() >= count; });
}

std::vector<CallbackRecorder::Call> CallbackRecorder::Calls() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return calls_;
}

}  // namespace vyr_test::apex
