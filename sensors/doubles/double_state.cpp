// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "double_state.h"

#include <thread>
#include <utility>

namespace sensor_doubles {

DoubleState& DoubleState::Get() {
    // Never destroyed: calls may still arrive from threads that outlive static destruction.
    static DoubleState* state = new DoubleState();
    return *state;
}

int DoubleState::OnCall(const char* name, std::vector<int64_t> args,
                        const ControlSettings* settings) {
    std::chrono::milliseconds delay{0};
    int result = 0;
    {
        std::unique_lock<std::mutex> lock(mutex);
        Call call;
        call.name = name;
        call.args = std::move(args);
        call.thread = std::this_thread::get_id();
        call.time = std::chrono::steady_clock::now();
        if (settings != nullptr) call.settings = *settings;
        call.als_enabled = als_instance != nullptr && als_instance->enabled.load();
        calls.push_back(std::move(call));
        changed.notify_all();

        HoldState& hold = holds[name];
        if (hold.held) {
            const uint64_t generation = hold.generation;
            ++hold.blocked;
            changed.notify_all();
            // Every release bumps the generation and forgets the calls it freed.
            changed.wait(lock, [&] { return hold.generation != generation; });
        }
        auto d = delays.find(name);
        if (d != delays.end()) delay = d->second;
        auto r = results.find(name);
        if (r != results.end()) result = r->second;
    }
    if (delay.count() > 0) std::this_thread::sleep_for(delay);
    return result;
}

MultiRangingData DoubleState::NextRangeData() {
    std::lock_guard<std::mutex> lock(mutex);
    if (range_queue.empty()) return range_data;
    MultiRangingData data = range_queue.front();
    range_queue.pop_front();
    return data;
}

ALSResult DoubleState::NextAlsData() {
    std::lock_guard<std::mutex> lock(mutex);
    if (als_queue.empty()) return als_data;
    ALSResult data = als_queue.front();
    als_queue.pop_front();
    return data;
}

bool DoubleState::AlsCreateFails() {
    std::lock_guard<std::mutex> lock(mutex);
    return als_create_fails;
}

bool DoubleState::RangeCreateFails() {
    std::lock_guard<std::mutex> lock(mutex);
    return range_create_fails;
}

void DoubleState::SetAlsInstance(AmbientLightSensor* instance) {
    std::lock_guard<std::mutex> lock(mutex);
    als_instance = instance;
}

void DoubleState::ReleaseLocked(HoldState& hold) {
    hold.held = false;
    hold.blocked = 0;
    ++hold.generation;
}

size_t DoubleState::CountLocked(const std::string& name) const {
    size_t count = 0;
    for (const Call& call : calls) {
        if (call.name == name) ++count;
    }
    return count;
}

}  // namespace sensor_doubles
