// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// AmbientLightSensor on the host: a thin front over one AlsSimulator per process.

#include "ambient_light_sensor.h"

#include <android/log.h>

#include <atomic>
#include <cerrno>
#include <mutex>
#include <optional>
#include <string>

#include "als_simulator.h"
#include "sensors_sim/scenario.h"

namespace {

std::mutex g_instance_mutex;
AmbientLightSensor* g_instance = nullptr;
std::atomic<sensors_sim::AlsSimulator*> g_simulator{nullptr};

}  // namespace

AmbientLightSensor* AmbientLightSensor::Create() {
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    if (g_instance != nullptr) return g_instance;
    const sensors_sim::Scenario scenario = sensors_sim::LoadScenario();
    if (scenario.als_create_fails) {
        __android_log_print(ANDROID_LOG_ERROR, "sensors_sim",
                            "ambient light sensor Create failed (scenario)");
        return nullptr;
    }
    std::optional<sensors_sim::Recording> replay;
    if (!sensors_sim::Recording::LoadReplay(
            scenario.als_replay, sensors_sim::Recording::Sensor::kLight, scenario.als_replay_loop,
            "als.replay", "ambient light sensor", &replay)) {
        return nullptr;
    }
    if (!replay) {
        __android_log_print(ANDROID_LOG_INFO, "sensors_sim",
                            "simulated ambient light sensor: seed %llu, extra latency %d ms",
                            static_cast<unsigned long long>(scenario.seed),
                            scenario.extra_latency_ms);
    }
    g_instance = new AmbientLightSensor();
    g_simulator = new sensors_sim::AlsSimulator(scenario, &g_instance->enabled, std::move(replay));
    return g_instance;
}

void AmbientLightSensor::Destroy() {
    std::lock_guard<std::mutex> lock(g_instance_mutex);
    // The simulator reads the instance's flag until it is gone, so it goes first.
    delete g_simulator.exchange(nullptr);
    delete g_instance;
    g_instance = nullptr;
}

int AmbientLightSensor::ReadSingleShot(ALSResult* result, bool wait, unsigned char integration_ms) {
    sensors_sim::AlsSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->ReadSingleShot(result, wait, integration_ms) : -ENODEV;
}

int AmbientLightSensor::Disable() {
    sensors_sim::AlsSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->Disable() : -ENODEV;
}

int AmbientLightSensor::SetTorchLightState(unsigned char state) {
    sensors_sim::AlsSimulator* simulator = g_simulator;
    return simulator != nullptr ? simulator->SetTorchLightState(state) : -ENODEV;
}
