// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <optional>

#include "sensors_sim/recording.h"
#include "sensors_sim/scenario.h"
#include "sensors_sim/scene_model.h"
#include "ubk/range_sensor.h"

namespace sensors_sim {

// A multi-zone time-of-flight part ranging continuously: while enabled it completes a frame every
// period (30 Hz unless configured), and Process hands out the next frame once it is ready. With a
// recording it hands out the recorded frames on their own time line instead.
class RangeSimulator {
  public:
    explicit RangeSimulator(const Scenario& scenario,
                            std::optional<Recording> replay = std::nullopt);
    ~RangeSimulator();
    RangeSimulator(const RangeSimulator&) = delete;
    RangeSimulator& operator=(const RangeSimulator&) = delete;

    int Init();
    int Uninit();
    int Enable(bool enable);
    int Process(MultiRangingData* data);
    int ConfigureParameters(const ControlSettings& settings);

  private:
    using Clock = std::chrono::steady_clock;

    Clock::duration PeriodLocked() const;
    // When frame `frame` is complete, and the scene time it shows, on the current schedule.
    Clock::time_point FrameReadyLocked(uint32_t frame) const;
    double FrameOffsetMsLocked(uint32_t frame) const;
    // The first frame that is not complete at `now`.
    uint32_t PendingFrameLocked(Clock::time_point now) const;
    // Starts a new schedule at `now` with `rate_hz`, continuing the frame numbers and scene time.
    void RestartScheduleLocked(Clock::time_point now, int rate_hz);
    void FillFrameLocked(uint32_t frame, Clock::time_point ready, MultiRangingData* data) const;
    void FillIdleLocked(Clock::time_point now, MultiRangingData* data) const;
    void PublishLocked() const;
    int ReplayLocked(std::unique_lock<std::mutex>& lock, MultiRangingData* data);

    const Scenario scenario_;
    const SceneModel scene_;

    std::mutex mutex_;
    // Signalled when ranging stops or the schedule changes, so blocked reads re-evaluate.
    std::condition_variable changed_;
    bool initialized_ = false;
    bool enabled_ = false;
    Clock::time_point init_time_;
    int frame_rate_hz_ = 30;
    // Frame base_frame_ completes one period after origin_, showing the scene at base_offset_ms_.
    Clock::time_point origin_;
    uint32_t base_frame_ = 0;
    double base_offset_ms_ = 0.0;
    uint32_t next_frame_ = 0;
    uint64_t schedule_version_ = 0;
    std::optional<Recording> replay_;
    // When the replay started: the last enable.
    Clock::time_point replay_start_;
};

}  // namespace sensors_sim
