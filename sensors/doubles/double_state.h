#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "sensor_doubles.h"

namespace sensor_doubles {

// The one recorder and script shared by both doubles and the test-facing functions.
class DoubleState {
  public:
    static DoubleState& Get();

    // Records the call, then blocks while the name is held, then sleeps its delay. Returns the
    // scripted result.
    int OnCall(const char* name, std::vector<int64_t> args,
               const ControlSettings* settings = nullptr);

    MultiRangingData NextRangeData();
    ALSResult NextAlsData();

    bool AlsCreateFails();
    bool RangeCreateFails();
    // The library's instance, whose enabled flag every recorded call samples.
    void SetAlsInstance(AmbientLightSensor* instance);

    void Reset();
    std::vector<Call> Calls();
    std::vector<Call> CallsNamed(const std::string& name);
    size_t CountOf(const std::string& name);
    bool WaitForCalls(const std::string& name, size_t count, std::chrono::milliseconds timeout);
    void SetAlsCreateFails(bool fails);
    void SetRangeCreateFails(bool fails);
    void SetResult(const std::string& name, int result);
    void SetRangeData(const MultiRangingData& data);
    void QueueRangeData(const MultiRangingData& data);
    void SetAlsData(const ALSResult& data);
    void QueueAlsData(const ALSResult& data);
    void SetDelay(const std::string& name, std::chrono::milliseconds delay);
    void Hold(const std::string& name);
    void Release(const std::string& name);
    bool WaitUntilHeld(const std::string& name, std::chrono::milliseconds timeout);

  private:
    struct HoldState {
        bool held = false;
        // Bumped by every release so a blocked call cannot miss one that is followed at once by
        // a new Hold.
        uint64_t generation = 0;
        // Calls blocked by the current hold; calls already released no longer count.
        size_t blocked = 0;
    };

    DoubleState() = default;
    size_t CountLocked(const std::string& name) const;
    void ReleaseLocked(HoldState& hold);

    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<Call> calls_;
    std::map<std::string, int> results_;
    std::map<std::string, std::chrono::milliseconds> delays_;
    std::map<std::string, HoldState> holds_;
    std::deque<MultiRangingData> range_queue_;
    std::deque<ALSResult> als_queue_;
    MultiRangingData range_data_{};
    ALSResult als_data_{};
    bool als_create_fails_ = false;
    bool range_create_fails_ = false;
    AmbientLightSensor* als_instance_ = nullptr;
};

}  // namespace sensor_doubles
