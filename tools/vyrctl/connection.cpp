// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "connection.h"

#include <android/binder_ibinder.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>

#include <mutex>
#include <thread>

#include "stop_signal.h"

namespace vyrctl {

using aidl::android::vyr::IVYRService;

namespace {

constexpr std::chrono::milliseconds kLookupInterval{100};

}  // namespace

std::unique_ptr<Connection> Connection::Open(std::chrono::milliseconds timeout, LineWriter* log) {
    auto start = std::chrono::steady_clock::now();
    auto deadline = start + timeout;
    bool announced = false;
    while (true) {
        ndk::SpAIBinder binder(AServiceManager_checkService(kServiceName));
        if (binder.get() != nullptr) {
            std::shared_ptr<IVYRService> service = IVYRService::fromBinder(binder);
            if (service == nullptr) {
                log->WriteLine(std::string("error: \"") + kServiceName + "\" does not implement " +
                               IVYRService::descriptor);
                return nullptr;
            }
            return std::unique_ptr<Connection>(new Connection(std::move(binder), service));
        }
        if (std::chrono::steady_clock::now() >= deadline || StopSignal::Requested()) break;
        if (!announced) {
            log->WriteLine("waiting for vyrservice...");
            announced = true;
        }
        StopSignal::SleepFor(kLookupInterval);
    }
    auto waited = std::chrono::duration<double>(std::chrono::steady_clock::now() - start);
    char text[160];
    snprintf(text, sizeof(text),
             "error: service \"%s\" not found after %.1f s (is vyrservice running, and "
             "VYR_BINDER_DIR the same as its?)",
             kServiceName, waited.count());
    log->WriteLine(text);
    return nullptr;
}

bool Connection::IsAlive() const {
    return AIBinder_isAlive(binder_.get());
}

void Connection::StartThreadPool() {
    static std::once_flag started;
    std::call_once(started, [] { ABinderProcess_startThreadPool(); });
}

std::string DescribeStatus(const ndk::ScopedAStatus& status) {
    return "transaction failed (exception " + std::to_string(status.getExceptionCode()) +
           ", status " + std::to_string(status.getStatus()) + ")";
}

}  // namespace vyrctl
