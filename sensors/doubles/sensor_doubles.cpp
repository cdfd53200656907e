#include "sensor_doubles.h"

#include "double_state.h"

namespace sensor_doubles {

void Reset() {
    DoubleState::Get().Reset();
}

std::vector<Call> Calls() {
    return DoubleState::Get().Calls();
}

std::vector<Call> CallsNamed(const std::string& name) {
    return DoubleState::Get().CallsNamed(name);
}

size_t CountOf(const std::string& name) {
    return DoubleState::Get().CountOf(name);
}

bool WaitForCalls(const std::string& name, size_t count, std::chrono::milliseconds timeout) {
    return DoubleState::Get().WaitForCalls(name, count, timeout);
}

void SetAlsCreateFails(bool fails) {
    DoubleState::Get().SetAlsCreateFails(fails);
}

void SetRangeCreateFails(bool fails) {
    DoubleState::Get().SetRangeCreateFails(fails);
}

void SetResult(const std::string& name, int result) {
    DoubleState::Get().SetResult(name, result);
}

void SetRangeData(const MultiRangingData& data) {
    DoubleState::Get().SetRangeData(data);
}

void QueueRangeData(const MultiRangingData& data) {
    DoubleState::Get().QueueRangeData(data);
}

void SetAlsData(const ALSResult& data) {
    DoubleState::Get().SetAlsData(data);
}

void QueueAlsData(const ALSResult& data) {
    DoubleState::Get().QueueAlsData(data);
}

void SetDelay(const std::string& name, std::chrono::milliseconds delay) {
    DoubleState::Get().SetDelay(name, delay);
}

void Hold(const std::string& name) {
    DoubleState::Get().Hold(name);
}

void Release(const std::string& name) {
    DoubleState::Get().Release(name);
}

bool WaitUntilHeld(const std::string& name, std::chrono::milliseconds timeout) {
    return DoubleState::Get().WaitUntilHeld(name, timeout);
}

}  // namespace sensor_doubles
