// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <mutex>

#include "double_state.h"
#include "ubk/range_sensor.h"

using sensor_doubles::DoubleState;

namespace ubk {
namespace {

std::mutex g_instance_mutex;
RangeSensor* g_instance = nullptr;

}  // namespace

RangeSensor* RangeSensor::Create() {
    DoubleState& state = DoubleState::Get();
    state.OnCall(sensor_doubles::kRangeCreate, {});
    if (state.RangeCreateFails()) return nullptr;
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    if (g_instance == nullptr) g_instance = new RangeSensor();
    return g_instance;
}

void RangeSensor::Destroy() {
    DoubleState::Get().OnCall(sensor_doubles::kRangeDestroy, {});
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    delete g_instance;
    g_instance = nullptr;
}

int RangeSensor::Init() {
    return DoubleState::Get().OnCall(sensor_doubles::kRangeInit, {});
}

int RangeSensor::Uninit() {
    return DoubleState::Get().OnCall(sensor_doubles::kRangeUninit, {});
}

int RangeSensor::Enable(bool enable) {
    return DoubleState::Get().OnCall(sensor_doubles::kRangeEnable, {enable ? 1 : 0});
}

int RangeSensor::Process(int mode, MultiRangingData* data) {
    DoubleState& state = DoubleState::Get();
    const int rc = state.OnCall(sensor_doubles::kRangeProcess, {mode});
    if (data != nullptr) *data = state.NextRangeData();
    return rc;
}

int RangeSensor::ConfigureParameters(const ControlSettings& settings) {
    return DoubleState::Get().OnCall(sensor_doubles::kRangeConfigureParameters, {}, &settings);
}

}  // namespace ubk
