// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// ubk::RangeSensor on the host: a thin front over one RangeSimulator per process.

#include "ubk/range_sensor.h"

#include <android/log.h>

#include <atomic>
#include <cerrno>
#include <mutex>
#include <optional>
#include <string>

#include "range_simulator.h"
#include "sensors_sim/scenario.h"

namespace ubk {
namespace {

std::mutex g_instance_mutex;
RangeSensor* g_instance = nullptr;
std::atomic<sensors_sim::RangeSimulator*> g_simulator{nullptr};

}  // namespace

RangeSensor* RangeSensor::Create() {
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    if (g_instance != nullptr) return g_instance;
    const sensors_sim::Scenario scenario = sensors_sim::LoadScenario();
    if (scenario.range_create_fails) {
        __android_log_print(ANDROID_LOG_ERROR, "sensors_sim",
                            "range sensor Create failed (scenario)");
        return nullptr;
    }
    std::optional<sensors_sim::Recording> replay;
    if (!sensors_sim::Recording::LoadReplay(
            scenario.range_replay, sensors_sim::Recording::Sensor::kRange,
            scenario.range_replay_loop, "range.replay", "range sensor", &replay)) {
        return nullptr;
    }
    if (!replay) {
        __android_log_print(ANDROID_LOG_INFO, "sensors_sim",
                            "simulated range sensor: seed %llu, %d zones, extra latency %d ms",
                            static_cast<unsigned long long>(scenario.seed), scenario.zone_count,
                            scenario.extra_latency_ms);
    }
    g_simulator = new sensors_sim::RangeSimulator(scenario, std::move(replay));
    g_instance = new RangeSensor();
    return g_instance;
}

void RangeSensor::Destroy() {
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    delete g_simulator.exchange(nullptr);
    delete g_instance;
    g_instance = nullptr;
}

int RangeSensor::Init() {
    sensors_sim::RangeSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->Init() : -ENODEV;
}

int RangeSensor::Uninit() {
    sensors_sim::RangeSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->Uninit() : -ENODEV;
}

int RangeSensor::Enable(bool enable) {
    sensors_sim::RangeSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->Enable(enable) : -ENODEV;
}

int RangeSensor::Process(int /*mode*/, MultiRangingData* data) {
    sensors_sim::RangeSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->Process(data) : -ENODEV;
}

int RangeSensor::ConfigureParameters(const ControlSettings& settings) {
    sensors_sim::RangeSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->ConfigureParameters(settings) : -ENODEV;
}

}  // namespace ubk
