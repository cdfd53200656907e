// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <thread>

#include "sensor_doubles.h"
#include "service_fixture.h"

namespace vyr_test::service {
namespace {

using namespace std::chrono_literals;
using aidl::android::vyr::IVYRService;
using android::vyr::binder::ServiceConfig;
using android::vyr::binder::VYRService;

// Holds the API lock by parking SetTorchLightState inside the sensor library, then makes a
// second call, which must give up after 10 s and end the process.
void CallWhileTheLockIsHeld() {
    sensor_doubles::Reset();
    sensor_doubles::Hold(sensor_doubles::kAlsSetTorchLightState);
    ServiceConfig config;
    config.get_bool_property = [](const char*, bool) { return true; };
    config.display_state_path = kNoDisplayPath;
    std::shared_ptr<IVYRService> service = ndk::SharedRefBase::make<VYRService>(config);
    std::thread holder([service] { service->SetTorchLightState(1); });
    if (!sensor_doubles::WaitUntilHeld(sensor_doubles::kAlsSetTorchLightState, kWait)) {
        fprintf(stderr, "the torch call never reached the library\n");
        _exit(2);
    }
    int32_t result = 0;
    service->Open(3, &result);
    fprintf(stderr, "Open returned %d without the lock\n", result);
    _exit(3);
}

TEST(ApiLockDeathTest, CallThatCannotTakeTheLockWithinTenSecondsAborts) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto start = std::chrono::steady_clock::now();
    EXPECT_DEATH(CallWhileTheLockIsHeld(),
                 "vyrservice F .*vyrservice\\.cpp:[0-9]+\\] Check failed: lck\\.owns_lock\\(\\) ");
    EXPECT_GE(std::chrono::steady_clock::now() - start, 10s);
}

}  // namespace
}  // namespace vyr_test::service
