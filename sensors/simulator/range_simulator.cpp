// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "range_simulator.h"

#include <android/log.h>

#include <algorithm>
#include <cerrno>

#include "state_file.h"

namespace sensors_sim {
namespace {

constexpr char kTag[] = "sensors_sim";
constexpr int kMinFrameRateHz = 1;
constexpr int kMaxFrameRateHz = 60;
constexpr uint8_t kRangeStateRanging = 1;
constexpr uint8_t kRangeStateIdle = 0;
constexpr uint8_t kDeviceStatusNotRanging = 1;
constexpr uint8_t kErrorInvalidFrame = 1;

}  // namespace

RangeSimulator::RangeSimulator(const Scenario& scenario, std::optional<Recording> replay)
    : scenario_(scenario), scene_(scenario.seed), replay_(std::move(replay)) {
    std::lock_guard<std::mutex> lock(mutex_);
    init_time_ = origin_ = Clock::now();
    PublishLocked();
}

RangeSimulator::~RangeSimulator() {
    StateFile::Get().Set({{"range.created", 0}, {"range.initialized", 0}, {"range.enabled", 0}});
}

int RangeSimulator::Init() {
    std::lock_guard<std::mutex> lock(mutex_);
    if (scenario_.range_init_fails) {
        __android_log_print(ANDROID_LOG_ERROR, kTag, "range sensor Init failed (scenario)");
        return -EIO;
    }
    // A second Init of a running part keeps its clock, as the service calls it on every enable.
    if (!initialized_) {
        initialized_ = true;
        init_time_ = Clock::now();
        PublishLocked();
    }
    return 0;
}

int RangeSimulator::Uninit() {
    std::lock_guard<std::mutex> lock(mutex_);
    initialized_ = false;
    PublishLocked();
    return 0;
}

int RangeSimulator::Enable(bool enable) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (enable && !enabled_) {
        RestartScheduleLocked(Clock::now(), frame_rate_hz_);
        if (replay_) {
            replay_->Restart();
            replay_start_ = Clock::now();
        }
    }
    enabled_ = enable;
    changed_.notify_all();
    PublishLocked();
    return 0;
}

int RangeSimulator::ConfigureParameters(const ControlSettings& settings) {
    std::lock_guard<std::mutex> lock(mutex_);
    const int rate = settings.frame_rate_hz;
    if (rate < kMinFrameRateHz || rate > kMaxFrameRateHz) {
        __android_log_print(ANDROID_LOG_WARN, kTag, "frame rate %d Hz out of range, keeping %d Hz",
                            rate, frame_rate_hz_);
        return 0;
    }
    if (rate != frame_rate_hz_) {
        RestartScheduleLocked(Clock::now(), rate);
        PublishLocked();
        changed_.notify_all();
    }
    return 0;
}

int RangeSimulator::Process(MultiRangingData* data) {
    if (data == nullptr) return -EINVAL;
    std::unique_lock<std::mutex> lock(mutex_);
    if (!enabled_) {
        // A stopped part has nothing to report; waiting a frame keeps a caller's loop from
        // spinning.
        changed_.wait_for(lock, PeriodLocked());
        FillIdleLocked(Clock::now(), data);
        return -EIO;
    }
    if (replay_) return ReplayLocked(lock, data);
    const auto latency = std::chrono::milliseconds(scenario_.extra_latency_ms);
    for (;;) {
        const uint64_t version = schedule_version_;
        const uint32_t frame = std::max(next_frame_, PendingFrameLocked(Clock::now()));
        changed_.wait_until(lock, FrameReadyLocked(frame) + latency,
                            [&] { return !enabled_ || schedule_version_ != version; });
        if (!enabled_) {
            FillIdleLocked(Clock::now(), data);
            return -EIO;
        }
        // Another reader may have taken this frame, or the rate changed: wait for the next one.
        if (schedule_version_ != version || frame < next_frame_) continue;
        // Stamped with when the frame was ready, not when a late reader took it: frames are
        // exactly one period apart, as a sensor's own clock would have them.
        FillFrameLocked(frame, FrameReadyLocked(frame), data);
        next_frame_ = frame + 1;
        return 0;
    }
}

int RangeSimulator::ReplayLocked(std::unique_lock<std::mutex>& lock, MultiRangingData* data) {
    for (;;) {
        const std::chrono::duration<double, std::milli> elapsed = Clock::now() - replay_start_;
        const Recording::Pick pick = replay_->Next(elapsed.count());
        if (pick.sample != nullptr) {
            *data = pick.sample->range;
            return 0;
        }
        // The recording is ahead of the sensor's time: wait for its next frame.
        const auto due =
            replay_start_ + std::chrono::duration_cast<Clock::duration>(
                                std::chrono::duration<double, std::milli>(pick.ready_at_ms));
        changed_.wait_until(lock, due, [&] { return !enabled_; });
        if (!enabled_) {
            FillIdleLocked(Clock::now(), data);
            return -EIO;
        }
    }
}

RangeSimulator::Clock::duration RangeSimulator::PeriodLocked() const {
    return std::chrono::nanoseconds(1000000000LL / frame_rate_hz_);
}

RangeSimulator::Clock::time_point RangeSimulator::FrameReadyLocked(uint32_t frame) const {
    return origin_ + PeriodLocked() * (static_cast<int64_t>(frame - base_frame_) + 1);
}

double RangeSimulator::FrameOffsetMsLocked(uint32_t frame) const {
    return base_offset_ms_ + static_cast<double>(frame - base_frame_) * 1000.0 / frame_rate_hz_;
}

uint32_t RangeSimulator::PendingFrameLocked(Clock::time_point now) const {
    if (now < origin_) return base_frame_;
    return base_frame_ + static_cast<uint32_t>((now - origin_) / PeriodLocked());
}

void RangeSimulator::RestartScheduleLocked(Clock::time_point now, int rate_hz) {
    const uint32_t frame = enabled_ ? std::max(next_frame_, PendingFrameLocked(now)) : next_frame_;
    base_offset_ms_ = FrameOffsetMsLocked(frame);
    base_frame_ = frame;
    origin_ = now;
    frame_rate_hz_ = rate_hz;
    ++schedule_version_;
}

void RangeSimulator::FillFrameLocked(uint32_t frame, Clock::time_point ready,
                                     MultiRangingData* data) const {
    *data = MultiRangingData{};
    const double offset_ms = FrameOffsetMsLocked(frame);
    scene_.FillZones(frame, offset_ms, scenario_.zone_count, data);
    data->time_ms = static_cast<uint32_t>(
        std::chrono::duration_cast<std::chrono::milliseconds>(ready - init_time_).count());
    data->stream_count = static_cast<uint8_t>(frame);
    data->device_status = 0;
    data->zone_count = static_cast<uint8_t>(scenario_.zone_count);
    data->range_state = kRangeStateRanging;
    data->effective_rate = static_cast<uint16_t>(frame_rate_hz_);
    data->temperature_c = scene_.TemperatureC(offset_ms);
    data->frame_number = frame;
    const bool invalid = scenario_.invalid_every > 0 &&
                         (static_cast<uint64_t>(frame) + 1) % scenario_.invalid_every == 0;
    data->error_flags = invalid ? kErrorInvalidFrame : 0;
    data->valid = invalid ? 0 : 1;
}

void RangeSimulator::FillIdleLocked(Clock::time_point now, MultiRangingData* data) const {
    *data = MultiRangingData{};
    data->time_ms = static_cast<uint32_t>(
        std::chrono::duration_cast<std::chrono::milliseconds>(now - init_time_).count());
    data->device_status = kDeviceStatusNotRanging;
    data->range_state = kRangeStateIdle;
    data->frame_number = next_frame_;
}

void RangeSimulator::PublishLocked() const {
    StateFile::Get().Set({{"range.created", 1},
                          {"range.initialized", initialized_ ? 1 : 0},
                          {"range.enabled", enabled_ ? 1 : 0},
                          {"range.frame_rate_hz", frame_rate_hz_}});
}

}  // namespace sensors_sim
