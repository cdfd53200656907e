// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <optional>
#include <thread>

#include "ambient_light_sensor.h"
#include "sensors_sim/recording.h"
#include "sensors_sim/scenario.h"
#include "sensors_sim/scene_model.h"

namespace sensors_sim {

// A spectral light sensor that integrates for the requested time per single-shot read. Like the
// real library it watches the owner's enabled flag on a sampling thread of its own. With a
// recording it hands out the recorded readings on their own time line instead of the scene's.
class AlsSimulator {
  public:
    AlsSimulator(const Scenario& scenario, const std::atomic<bool>* enabled,
                 std::optional<Recording> replay = std::nullopt);
    ~AlsSimulator();
    AlsSimulator(const AlsSimulator&) = delete;
    AlsSimulator& operator=(const AlsSimulator&) = delete;

    int ReadSingleShot(ALSResult* result, bool wait, unsigned char integration_ms);
    int Disable();
    int SetTorchLightState(unsigned char state);

  private:
    void WatchEnabled();
    void PublishLocked();
    // The next recorded reading, waiting for it while the recording is ahead.
    int Replay(ALSResult* result);

    const Scenario scenario_;
    const SceneModel scene_;
    const std::atomic<bool>* const enabled_;

    std::mutex mutex_;
    std::condition_variable stop_;
    bool stopping_ = false;
    bool seen_enabled_ = false;
    unsigned char torch_state_ = 0;
    uint64_t next_index_ = 0;
    std::optional<Recording> replay_;
    // When the replay started: the read that found the sensor newly enabled.
    std::chrono::steady_clock::time_point replay_start_;
    std::thread watcher_;
};

}  // namespace sensors_sim
