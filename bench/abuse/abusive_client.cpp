// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "abusive_client.h"

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>

#include <chrono>
#include <cstdio>
#include <thread>

#include "ignoring_callback.h"

namespace vyr_bench::abuse {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;

void Reached(const char* step) {
    printf("%s\n", step);
    fflush(stdout);
}

}  // namespace

int RunAbusiveClient(int mode, bool with_callback) {
    ABinderProcess_startThreadPool();
    Reached("started");
    ndk::SpAIBinder binder(AServiceManager_waitForService("vyrservice"));
    std::shared_ptr<IVYRService> service = IVYRService::fromBinder(binder);
    if (service == nullptr) return 2;
    int32_t handle = -1;
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    while (handle == -1 && std::chrono::steady_clock::now() < deadline) {
        if (!service->Open(mode, &handle).isOk()) return 3;
        if (handle == -1) std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    if (handle <= 0) return 4;
    Reached("opened");
    int32_t result = 0;
    if (with_callback) {
        service->SetCallback(handle, ndk::SharedRefBase::make<vyr_test::IgnoringCallback>(),
                             &result);
        Reached("callback");
    }
    service->Enable(handle, 20, &result);
    Reached("enabled");
    Reached("polling");
    for (;;) {
        Event event;
        if (!service->PollOnce(handle, &event, &result).isOk()) return 5;
    }
}

}  // namespace vyr_bench::abuse
