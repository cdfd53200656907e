// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Random transactions into one real VYRService through the binder fuzzing driver: the same source
// is the device's cc_fuzz (the platform's driver) and the host's libFuzzer target (the host
// runtime's driver). Both link the sensor doubles, never the sensor libraries: random calls must
// not drive the hardware.
#include <android/log.h>
#include <fuzzbinder/libbinder_ndk_driver.h>
#include <fuzzer/FuzzedDataProvider.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>

#include "service_config.h"
#include "vyrservice.h"

namespace vyr_test::service {
namespace {

using android::vyr::binder::ServiceConfig;
using android::vyr::binder::VYRService;

// One service for the whole run: like the deployed one it is never destroyed, so client state
// carries over from input to input and the display monitor may stay blocked in poll.
std::shared_ptr<VYRService> Service() {
    static std::shared_ptr<VYRService>* service = [] {
        // Millions of calls each log a line; only a fatal check is worth seeing.
        __android_log_set_minimum_priority(ANDROID_LOG_FATAL);
        ServiceConfig config = ServiceConfig::Production();
        // Both sensors, so that every method can reach a sensor, and no start-up delay.
        config.get_bool_property = [](const char*, bool) { return true; };
        config.startup_delay = std::chrono::milliseconds(0);
        return new std::shared_ptr<VYRService>(ndk::SharedRefBase::make<VYRService>(config));
    }();
    return *service;
}

}  // namespace
}  // namespace vyr_test::service

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    using namespace vyr_test::service;
    android::fuzzService(Service()->asBinder().get(), FuzzedDataProvider(data, size));
    return 0;
}
