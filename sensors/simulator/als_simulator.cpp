// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "als_simulator.h"

#include <cerrno>
#include <chrono>

#include "state_file.h"

namespace sensors_sim {
namespace {

// How often the watcher looks at the enabled flag while the sensor is on.
constexpr std::chrono::milliseconds kWatchInterval{10};
constexpr uint8_t kStatusOk = 0;
constexpr uint8_t kStatusInvalid = 1;
constexpr uint8_t kStatusNotEnabled = 2;

}  // namespace

AlsSimulator::AlsSimulator(const Scenario& scenario, const std::atomic<bool>* enabled,
                           std::optional<Recording> replay)
    : scenario_(scenario), scene_(scenario.seed), enabled_(enabled), replay_(std::move(replay)) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        seen_enabled_ = enabled_->load();
        PublishLocked();
    }
    watcher_ = std::thread(&AlsSimulator::WatchEnabled, this);
}

AlsSimulator::~AlsSimulator() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        stopping_ = true;
    }
    stop_.notify_all();
    watcher_.join();
    StateFile::Get().Set({{"als.created", 0}, {"als.enabled", 0}, {"torch", 0}});
}

int AlsSimulator::ReadSingleShot(ALSResult* result, bool wait, unsigned char integration_ms) {
    if (result == nullptr) return -EINVAL;
    uint64_t index;
    bool torch_lit;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        index = next_index_++;
        torch_lit = torch_state_ != 0;
        // The service reads as soon as it has switched the sensor on: the watcher learns of it
        // here, and watches the flag only from now on.
        if (enabled_->load() && !seen_enabled_) {
            seen_enabled_ = true;
            PublishLocked();
            stop_.notify_all();
            if (replay_) {
                replay_->Restart();
                replay_start_ = std::chrono::steady_clock::now();
            }
        }
    }
    if (wait) {
        std::this_thread::sleep_for(std::chrono::milliseconds(integration_ms) +
                                    std::chrono::milliseconds(scenario_.extra_latency_ms));
    }
    const int64_t now_ns = std::chrono::duration_cast<std::chrono::nanoseconds>(
                               std::chrono::steady_clock::now().time_since_epoch())
                               .count();
    if (!enabled_->load()) {
        *result = ALSResult{};
        result->status = kStatusNotEnabled;
        result->timestamp_ns = now_ns;
        return -EIO;
    }
    if (replay_) return Replay(result);
    *result = scene_.LightSample(index, torch_lit, integration_ms);
    const bool invalid = scenario_.invalid_every > 0 && (index + 1) % scenario_.invalid_every == 0;
    result->status = invalid ? kStatusInvalid : kStatusOk;
    result->reserved = integration_ms;
    result->valid = invalid ? 0 : 1;
    result->timestamp_ns = now_ns;
    return 0;
}

int AlsSimulator::Replay(ALSResult* result) {
    std::unique_lock<std::mutex> lock(mutex_);
    for (;;) {
        const std::chrono::duration<double, std::milli> elapsed =
            std::chrono::steady_clock::now() - replay_start_;
        const Recording::Pick pick = replay_->Next(elapsed.count());
        if (pick.sample != nullptr) {
            *result = pick.sample->light;
            if (result->valid == 0) result->status = kStatusInvalid;
            return 0;
        }
        // The recording is ahead: wait for its next reading, or for the sensor to go off.
        const auto due =
            replay_start_ + std::chrono::duration_cast<std::chrono::nanoseconds>(
                                std::chrono::duration<double, std::milli>(pick.ready_at_ms));
        stop_.wait_until(lock, std::min(due, std::chrono::steady_clock::now() + kWatchInterval),
                         [this] { return stopping_; });
        if (stopping_ || !enabled_->load()) {
            *result = ALSResult{};
            result->status = kStatusNotEnabled;
            return -EIO;
        }
    }
}

int AlsSimulator::Disable() {
    // Powering down only saves energy; the next read powers the part up again.
    return 0;
}

int AlsSimulator::SetTorchLightState(unsigned char state) {
    std::lock_guard<std::mutex> lock(mutex_);
    torch_state_ = state;
    PublishLocked();
    return 0;
}

// The library sees the flag go off only by looking at it, so it looks, but only while the sensor
// is on: an idle sensor costs no wake-ups.
void AlsSimulator::WatchEnabled() {
    std::unique_lock<std::mutex> lock(mutex_);
    while (!stopping_) {
        if (!seen_enabled_) {
            stop_.wait(lock);
            continue;
        }
        stop_.wait_for(lock, kWatchInterval);
        if (seen_enabled_ && !enabled_->load()) {
            seen_enabled_ = false;
            PublishLocked();
        }
    }
}

void AlsSimulator::PublishLocked() {
    StateFile::Get().Set(
        {{"als.created", 1}, {"als.enabled", seen_enabled_ ? 1 : 0}, {"torch", torch_state_}});
}

}  // namespace sensors_sim
