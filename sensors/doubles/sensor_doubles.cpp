// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensor_doubles.h"

#include "double_state.h"

namespace sensor_doubles {

void Reset() {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.calls.clear();
    s.results.clear();
    s.delays.clear();
    // Entries stay while calls are blocked on them; releasing lets those calls return.
    for (auto& [name, hold] : s.holds) s.ReleaseLocked(hold);
    s.range_queue.clear();
    s.als_queue.clear();
    s.range_data = MultiRangingData{};
    s.als_data = ALSResult{};
    s.als_create_fails = false;
    s.range_create_fails = false;
    s.changed.notify_all();
}

std::vector<Call> Calls() {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    return s.calls;
}

std::vector<Call> CallsNamed(const std::string& name) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    std::vector<Call> named;
    for (const Call& call : s.calls) {
        if (call.name == name) named.push_back(call);
    }
    return named;
}

size_t CountOf(const std::string& name) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    return s.CountLocked(name);
}

bool WaitForCalls(const std::string& name, size_t count, std::chrono::milliseconds timeout) {
    DoubleState& s = DoubleState::Get();
    std::unique_lock<std::mutex> lock(s.mutex);
    return s.changed.wait_for(lock, timeout, [&] { return s.CountLocked(name) >= count; });
}

void SetAlsCreateFails(bool fails) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.als_create_fails = fails;
}

void SetRangeCreateFails(bool fails) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.range_create_fails = fails;
}

void SetResult(const std::string& name, int result) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.results[name] = result;
}

void SetRangeData(const MultiRangingData& data) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.range_data = data;
}

void QueueRangeData(const MultiRangingData& data) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.range_queue.push_back(data);
}

void SetAlsData(const ALSResult& data) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.als_data = data;
}

void QueueAlsData(const ALSResult& data) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.als_queue.push_back(data);
}

void SetDelay(const std::string& name, std::chrono::milliseconds delay) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.delays[name] = delay;
}

void Hold(const std::string& name) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.holds[name].held = true;
}

void Release(const std::string& name) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.ReleaseLocked(s.holds[name]);
    s.changed.notify_all();
}

void ReleaseBlocked(const std::string& name) {
    DoubleState& s = DoubleState::Get();
    std::lock_guard<std::mutex> lock(s.mutex);
    s.ReleaseLocked(s.holds[name]);
    s.holds[name].held = true;
    s.changed.notify_all();
}

bool WaitUntilHeld(const std::string& name, std::chrono::milliseconds timeout) {
    DoubleState& s = DoubleState::Get();
    std::unique_lock<std::mutex> lock(s.mutex);
    return s.changed.wait_for(lock, timeout, [&] { return s.holds[name].blocked > 0; });
}

}  // namespace sensor_doubles
