// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <mutex>

#include "ambient_light_sensor.h"
#include "double_state.h"

using sensor_doubles::DoubleState;

namespace {

std::mutex g_instance_mutex;
AmbientLightSensor* g_instance = nullptr;

}  // namespace

AmbientLightSensor* AmbientLightSensor::Create() {
    DoubleState& state = DoubleState::Get();
    state.OnCall(sensor_doubles::kAlsCreate, {});
    if (state.AlsCreateFails()) return nullptr;
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    if (g_instance == nullptr) {
        g_instance = new AmbientLightSensor();
        state.SetAlsInstance(g_instance);
    }
    return g_instance;
}

void AmbientLightSensor::Destroy() {
    DoubleState& state = DoubleState::Get();
    state.OnCall(sensor_doubles::kAlsDestroy, {});
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    // Unpublished first so a concurrent call never samples a deleted flag.
    state.SetAlsInstance(nullptr);
    delete g_instance;
    g_instance = nullptr;
}

int AmbientLightSensor::ReadSingleShot(ALSResult* result, bool wait, unsigned char integration_ms) {
    DoubleState& state = DoubleState::Get();
    const int rc = state.OnCall(sensor_doubles::kAlsReadSingleShot,
                                {wait ? 1 : 0, static_cast<int64_t>(integration_ms)});
    if (result != nullptr) *result = state.NextAlsData();
    return rc;
}

int AmbientLightSensor::Disable() {
    return DoubleState::Get().OnCall(sensor_doubles::kAlsDisable, {});
}

int AmbientLightSensor::SetTorchLightState(unsigned char state) {
    return DoubleState::Get().OnCall(sensor_doubles::kAlsSetTorchLightState,
                                     {static_cast<int64_t>(state)});
}
