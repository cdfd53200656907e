// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service on the sensor test doubles, in a process of its own, and a client of it: what the
// cross-process suite starts beside itself, on the host and on a device alike.
//
//   vyr_doubles_service serve <name>   registers a VYRService (range sensor only, no start-up
//                                      delay) as <name>, prints "registered", serves for good
//   vyr_doubles_service client <name>  opens a range handle with a callback, enables it at
//                                      20 ms, prints "handle <h>" and waits to be killed

#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>

#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_config.h"
#include "vyrservice.h"

namespace {

using aidl::android::vyr::IVYRService;
using android::vyr::binder::ServiceConfig;
using android::vyr::binder::VYRService;

constexpr int32_t kRange = 3;

int Serve(const char* name) {
    // A valid one-zone frame at every read.
    MultiRangingData frame{};
    frame.time_ms = 1;
    frame.zone_count = 1;
    frame.zones[0].distance_mm = 500;
    frame.valid = 1;
    sensor_doubles::SetRangeData(frame);
    ServiceConfig config;
    // The properties' defaults: the range sensor only, and so no display monitor.
    config.get_bool_property = [](const char* /*key*/, bool default_value) { return default_value; };
    config.startup_delay = std::chrono::milliseconds(0);
    auto service = ndk::SharedRefBase::make<VYRService>(config);
    ABinderProcess_startThreadPool();
    if (AServiceManager_addService(service->asBinder().get(), name) != EX_NONE) return 2;
    printf("registered\n");
    fflush(stdout);
    ABinderProcess_joinThreadPool();
    return 1;
}

int Client(const char* name) {
    ABinderProcess_startThreadPool();
    std::shared_ptr<IVYRService> service =
        IVYRService::fromBinder(ndk::SpAIBinder(AServiceManager_waitForService(name)));
    if (service == nullptr) return 2;
    int32_t handle = 0;
    int32_t result = 0;
    auto callback = ndk::SharedRefBase::make<vyr_test::RecordingCallback>();
    if (!service->Open(kRange, &handle).isOk() || handle <= 0) return 3;
    if (!service->SetCallback(handle, callback, &result).isOk() || result != 0) return 4;
    if (!service->Enable(handle, 20, &result).isOk() || result != 0) return 5;
    printf("handle %d\n", handle);
    fflush(stdout);
    for (;;) pause();
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 3 && strcmp(argv[1], "serve") == 0) return Serve(argv[2]);
    if (argc == 3 && strcmp(argv[1], "client") == 0) return Client(argv[2]);
    fprintf(stderr, "usage: %s serve|client <name>\n", argv[0]);
    return 64;
}
