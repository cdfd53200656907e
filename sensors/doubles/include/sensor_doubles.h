// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Test doubles of the two sensor libraries: every call is recorded with its arguments and thread,
// and a test can script results, fail calls and hold a call until it releases it. All functions
// are thread-safe.

#include <chrono>
#include <cstdint>
#include <string>
#include <thread>
#include <vector>

#include "ambient_light_sensor.h"
#include "ubk/range_sensor.h"

namespace sensor_doubles {

// Call names, as recorded.
inline constexpr char kAlsCreate[] = "AmbientLightSensor::Create";
inline constexpr char kAlsDestroy[] = "AmbientLightSensor::Destroy";
inline constexpr char kAlsReadSingleShot[] = "AmbientLightSensor::ReadSingleShot";
inline constexpr char kAlsDisable[] = "AmbientLightSensor::Disable";
inline constexpr char kAlsSetTorchLightState[] = "AmbientLightSensor::SetTorchLightState";
inline constexpr char kRangeCreate[] = "RangeSensor::Create";
inline constexpr char kRangeDestroy[] = "RangeSensor::Destroy";
inline constexpr char kRangeInit[] = "RangeSensor::Init";
inline constexpr char kRangeUninit[] = "RangeSensor::Uninit";
inline constexpr char kRangeEnable[] = "RangeSensor::Enable";
inline constexpr char kRangeProcess[] = "RangeSensor::Process";
inline constexpr char kRangeConfigureParameters[] = "RangeSensor::ConfigureParameters";

struct Call {
    std::string name;
    // Scalar arguments in order (bool as 0/1, unsigned char zero-extended). Pointer arguments are
    // not recorded; ConfigureParameters records the settings in `settings`.
    std::vector<int64_t> args;
    std::thread::id thread;
    std::chrono::steady_clock::time_point time;
    ControlSettings settings{};
    // AmbientLightSensor::enabled as the library saw it when the call was made.
    bool als_enabled = false;
};

// Forgets every call, script and hold; Create() succeeds again; data returns to all-zero records.
void Reset();

std::vector<Call> Calls();
std::vector<Call> CallsNamed(const std::string& name);
size_t CountOf(const std::string& name);
// Waits until at least `count` calls named `name` were recorded; false on time-out.
bool WaitForCalls(const std::string& name, size_t count, std::chrono::milliseconds timeout);

// Create() of the named library returns null while set.
void SetAlsCreateFails(bool fails);
void SetRangeCreateFails(bool fails);

// The int result of every later call named `name` (default 0).
void SetResult(const std::string& name, int result);

// Data that later Process / ReadSingleShot calls fill in (default all zero). A queued record is
// used once, in order; when the queue is empty the persistent record is used.
void SetRangeData(const MultiRangingData& data);
void QueueRangeData(const MultiRangingData& data);
void SetAlsData(const ALSResult& data);
void QueueAlsData(const ALSResult& data);

// Every later call named `name` sleeps this long before it returns (default none).
void SetDelay(const std::string& name, std::chrono::milliseconds delay);

// Calls named `name` block (after being recorded) until Release(name).
void Hold(const std::string& name);
void Release(const std::string& name);
// Lets the calls named `name` that are blocked now go on and keeps holding the name, in one step:
// the next call blocks however soon it comes (Release and then Hold would let a fast one through).
void ReleaseBlocked(const std::string& name);
// Waits until a call named `name` is blocked by Hold; false on time-out.
bool WaitUntilHeld(const std::string& name, std::chrono::milliseconds timeout);

}  // namespace sensor_doubles
