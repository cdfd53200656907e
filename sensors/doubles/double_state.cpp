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
        std::unique_lock<std::mutex> lock(mutex_);
        Call call;
        call.name = name;
        call.args = std::move(args);
        call.thread = std::this_thread::get_id();
        call.time = std::chrono::steady_clock::now();
        if (settings != nullptr) call.settings = *settings;
        call.als_enabled = als_instance_ != nullptr && als_instance_->enabled.load();
        calls_.push_back(std::move(call));
        changed_.notify_all();

        HoldState& hold = holds_[name];
        if (hold.held) {
            const uint64_t generation = hold.generation;
            ++hold.blocked;
            changed_.notify_all();
            // Every release bumps the generation and forgets the calls it freed.
            changed_.wait(lock, [&] { return hold.generation != generation; });
        }
        auto d = delays_.find(name);
        if (d != delays_.end()) delay = d->second;
        auto r = results_.find(name);
        if (r != results_.end()) result = r->second;
    }
    if (delay.count() > 0) std::this_thread::sleep_for(delay);
    return result;
}

MultiRangingData DoubleState::NextRangeData() {
    std::lock_guard<std::mutex> lock(mutex_);
    if (range_queue_.empty()) return range_data_;
    MultiRangingData data = range_queue_.front();
    range_queue_.pop_front();
    return data;
}

ALSResult DoubleState::NextAlsData() {
    std::lock_guard<std::mutex> lock(mutex_);
    if (als_queue_.empty()) return als_data_;
    ALSResult data = als_queue_.front();
    als_queue_.pop_front();
    return data;
}

bool DoubleState::AlsCreateFails() {
    std::lock_guard<std::mutex> lock(mutex_);
    return als_create_fails_;
}

bool DoubleState::RangeCreateFails() {
    std::lock_guard<std::mutex> lock(mutex_);
    return range_create_fails_;
}

void DoubleState::SetAlsInstance(AmbientLightSensor* instance) {
    std::lock_guard<std::mutex> lock(mutex_);
    als_instance_ = instance;
}

void DoubleState::ReleaseLocked(HoldState& hold) {
    hold.held = false;
    hold.blocked = 0;
    ++hold.generation;
}

void DoubleState::Reset() {
    std::lock_guard<std::mutex> lock(mutex_);
    calls_.clear();
    results_.clear();
    delays_.clear();
    // Entries stay while calls are blocked on them; releasing lets those calls return.
    for (auto& [name, hold] : holds_) ReleaseLocked(hold);
    range_queue_.clear();
    als_queue_.clear();
    range_data_ = MultiRangingData{};
    als_data_ = ALSResult{};
    als_create_fails_ = false;
    range_create_fails_ = false;
    changed_.notify_all();
}

std::vector<Call> DoubleState::Calls() {
    std::lock_guard<std::mutex> lock(mutex_);
    return calls_;
}

std::vector<Call> DoubleState::CallsNamed(const std::string& name) {
    std::lock_guard<std::mutex> lock(mutex_);
    std::vector<Call> named;
    for (const Call& call : calls_) {
        if (call.name == name) named.push_back(call);
    }
    return named;
}

size_t DoubleState::CountLocked(const std::string& name) const {
    size_t count = 0;
    for (const Call& call : calls_) {
        if (call.name == name) ++count;
    }
    return count;
}

size_t DoubleState::CountOf(const std::string& name) {
    std::lock_guard<std::mutex> lock(mutex_);
    return CountLocked(name);
}

bool DoubleState::WaitForCalls(const std::string& name, size_t count,
                               std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, timeout, [&] { return CountLocked(name) >= count; });
}

void DoubleState::SetAlsCreateFails(bool fails) {
    std::lock_guard<std::mutex> lock(mutex_);
    als_create_fails_ = fails;
}

void DoubleState::SetRangeCreateFails(bool fails) {
    std::lock_guard<std::mutex> lock(mutex_);
    range_create_fails_ = fails;
}

void DoubleState::SetResult(const std::string& name, int result) {
    std::lock_guard<std::mutex> lock(mutex_);
    results_[name] = result;
}

void DoubleState::SetRangeData(const MultiRangingData& data) {
    std::lock_guard<std::mutex> lock(mutex_);
    range_data_ = data;
}

void DoubleState::QueueRangeData(const MultiRangingData& data) {
    std::lock_guard<std::mutex> lock(mutex_);
    range_queue_.push_back(data);
}

void DoubleState::SetAlsData(const ALSResult& data) {
    std::lock_guard<std::mutex> lock(mutex_);
    als_data_ = data;
}

void DoubleState::QueueAlsData(const ALSResult& data) {
    std::lock_guard<std::mutex> lock(mutex_);
    als_queue_.push_back(data);
}

void DoubleState::SetDelay(const std::string& name, std::chrono::milliseconds delay) {
    std::lock_guard<std::mutex> lock(mutex_);
    delays_[name] = delay;
}

void DoubleState::Hold(const std::string& name) {
    std::lock_guard<std::mutex> lock(mutex_);
    holds_[name].held = true;
}

void DoubleState::Release(const std::string& name) {
    std::lock_guard<std::mutex> lock(mutex_);
    ReleaseLocked(holds_[name]);
    changed_.notify_all();
}

bool DoubleState::WaitUntilHeld(const std::string& name, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, timeout, [&] { return holds_[name].blocked > 0; });
}

}  // namespace sensor_doubles
