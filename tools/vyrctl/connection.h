// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Finding "vyrservice" through the service manager, with a clear wait and a time-out.

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_auto_utils.h>

#include <chrono>
#include <memory>
#include <string>

#include "line_writer.h"

namespace vyrctl {

constexpr char kServiceName[] = "vyrservice";

class Connection {
  public:
    // Looks the service up until `timeout` has passed; says once on `log` that it is waiting.
    // Returns null after printing the reason when the service never appeared.
    static std::unique_ptr<Connection> Open(std::chrono::milliseconds timeout, LineWriter* log);

    const std::shared_ptr<aidl::android::vyr::IVYRService>& service() const { return service_; }
    bool IsAlive() const;

    // Callbacks are served on this process's binder thread pool, which only they need.
    static void StartThreadPool();

  private:
    Connection(ndk::SpAIBinder binder, std::shared_ptr<aidl::android::vyr::IVYRService> service)
        : binder_(std::move(binder)), service_(std::move(service)) {}

    ndk::SpAIBinder binder_;
    std::shared_ptr<aidl::android::vyr::IVYRService> service_;
};

// "transaction failed (exception E, status S)" for a status that is not OK.
std::string DescribeStatus(const ndk::ScopedAStatus& status);

}  // namespace vyrctl
