// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "honest_clients.h"

#include <chrono>

namespace vyr_bench::abuse {

using aidl::android::vyr::Event;

HonestClients::HonestClients(std::shared_ptr<aidl::android::vyr::IVYRService> service, int count)
    : service_(std::move(service)) {
    for (int i = 0; i < count; ++i) threads_.emplace_back(&HonestClients::Run, this, i);
}

HonestClients::~HonestClients() {
    stop_ = true;
    for (std::thread& thread : threads_) thread.join();
}

void HonestClients::Run(int index) {
    // One call, timed; false when its status was not OK.
    const auto timed = [this](auto&& call) {
        const auto start = std::chrono::steady_clock::now();
        const bool ok = call().isOk();
        latencies_.Add(std::chrono::steady_clock::now() - start);
        if (!ok) ++failed_calls_;
        return ok;
    };
    const int32_t mode = index % 2 == 0 ? 3 : 1;
    while (!stop_) {
        int32_t handle = 0;
        int32_t result = 0;
        if (!timed([&] { return service_->Open(mode, &handle); })) continue;
        if (handle <= 0) {
            ++full_table_;
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
            continue;
        }
        timed([&] { return service_->Enable(handle, 20, &result); });
        for (int i = 0; i < 5 && !stop_; ++i) {
            Event event;
            timed([&] { return service_->PollOnce(handle, &event, &result); });
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        timed([&] { return service_->Disable(handle); });
        timed([&] { return service_->Close(handle); });
    }
}

}  // namespace vyr_bench::abuse
