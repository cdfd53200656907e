// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Well-behaved clients on threads of this process: each opens a handle, enables it, polls a
// few times, disables and closes, over and over, timing every call.

#include <aidl/android/vyr/IVYRService.h>

#include <atomic>
#include <memory>
#include <thread>
#include <vector>

#include "latencies.h"

namespace vyr_bench::abuse {

class HonestClients {
  public:
    HonestClients(std::shared_ptr<aidl::android::vyr::IVYRService> service, int count);
    // Stops and joins the clients.
    ~HonestClients();

    Latencies& latencies() { return latencies_; }
    // Calls whose binder status was not OK: the service was gone or broken.
    long failed_calls() const { return failed_calls_.load(); }
    // Opens refused because the table was full.
    long full_table() const { return full_table_.load(); }

  private:
    void Run(int index);

    std::shared_ptr<aidl::android::vyr::IVYRService> service_;
    Latencies latencies_;
    std::atomic<bool> stop_{false};
    std::atomic<long> failed_calls_{0};
    std::atomic<long> full_table_{0};
    std::vector<std::thread> threads_;
};

}  // namespace vyr_bench::abuse
