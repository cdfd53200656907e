// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// One sensor mode of vyrservice for an application, kept in force across restarts of the
// service (it exits after every update of the camera HAL's package, and init starts it again).
//
// The client opens a handle, sets its callback (or leaves the application to poll), applies the
// low-power choice and the control values, and enables the handle at its period. When the
// service's binder dies it tells the application, waits for "vyrservice" to be registered again
// (woken by the registration, never looking again and again), opens a new handle, re-applies
// every setting and tells the application that events resume. An Open refused while other
// clients re-attach (-1, table full) or while the new instance lacks the sensor (-19) is tried
// again after a growing delay, and given up after ReattachPolicy::max_refusals refusals.
//
// Threading:
// - The process must run a binder thread pool (ABinderProcess_startThreadPool) before Start:
//   the service's death notice, its registration notices and the events of a callback client
//   arrive on the pool's threads only, and a process without a pool would never learn that the
//   service died. Start refuses with kNoThreadPool otherwise.
// - OnEvent runs on a binder thread, one event at a time.
// - OnSettingRefused runs on the thread of Start for the first attach; every other listener
//   call (lost, refused, resumed, gave up, and OnSettingRefused on a re-attach) runs on the
//   client's own re-attach thread.
// - From any listener call the application may call Poll(), handle() and state(); it must not
//   call Stop() or destroy the client, which wait for listener calls to end.
// - Start, Stop and the destructor are called from one thread of the application; Poll, handle
//   and state from any.
// Stop (or destruction) at any moment, a re-attach included, disables and closes the handle
// that is open in the service, ends the client's thread and releases every binder it holds.

#include <aidl/android/vyr/Event.h>
#include <aidl/android/vyr/IVYRService.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace vyr {

// What the client keeps in force on the service.
struct SensorSettings {
    // 1: spectral ambient light, 3: range.
    int32_t mode = 3;
    int32_t period_ms = 1000;
    // Events pushed through SensorClientListener::OnEvent; false: the application calls Poll.
    bool use_callback = true;
    // EnableLowPower with this value, when set (light handles only).
    std::optional<bool> low_power;
    // ConfigureParameters with these values, when not empty (range handles: eleven values).
    std::vector<int32_t> control_values;
    // The newest interface version to use. From 2, a callback client of a service that offers
    // version 2 is enabled on sample: each reading is pushed as soon as the service stores it,
    // not on a timer of its own. 1 keeps the timer of version 1 on every service.
    int32_t max_interface_version = 2;
};

struct ReattachPolicy {
    // False: a lost service is only reported (state kLost).
    bool reattach = true;
    // The delay before an Open refused by a new instance is tried again, doubled after each
    // refusal up to max_delay.
    std::chrono::milliseconds first_delay{250};
    std::chrono::milliseconds max_delay{4000};
    // Refusals in a row after which the client gives up.
    int max_refusals = 30;
    // The name whose next registration is waited for: the service's own, or a test instance's.
    std::string service_name = "vyrservice";
};

class SensorClientListener {
  public:
    virtual ~SensorClientListener() = default;
    // `event.boottime` is when the service read the sample, in CLOCK_BOOTTIME nanoseconds (0 from
    // a service of version 1).
    virtual void OnEvent(const aidl::android::vyr::Event& /*event*/) {}
    // The service's binder died; `handle` is gone with it.
    virtual void OnServiceLost(int32_t /*handle*/) {}
    // A new instance refused Open with `result`; tried again in `retry_in`.
    virtual void OnOpenRefused(int32_t /*result*/, int /*attempt*/,
                               std::chrono::milliseconds /*retry_in*/) {}
    // Attached again with every setting re-applied: the handle before and after, and how long
    // it has been since the last event (pushed, or returned by Poll).
    virtual void OnResumed(int32_t /*old_handle*/, int32_t /*new_handle*/,
                           std::chrono::milliseconds /*since_last_event*/) {}
    // No more re-attaching, for `reason`.
    virtual void OnGaveUp(const std::string& /*reason*/) {}
    // The service refused a setting that the client goes on without ("low power", "control
    // values"), with its result code.
    virtual void OnSettingRefused(const std::string& /*setting*/, int32_t /*result*/) {}
};

class SensorClient {
  public:
    enum class State { kIdle, kAttached, kReattaching, kLost, kGaveUp, kStopped };
    // Poll's answer while no handle is open in a live service (-ENOTCONN); Start's when the
    // service is unreachable.
    static constexpr int32_t kNotAttached = -107;
    // Start's answer when the process runs no binder thread pool (-EAGAIN): start it first.
    static constexpr int32_t kNoThreadPool = -11;
    static constexpr char kServiceName[] = "vyrservice";

    // `listener` must outlive the client.
    SensorClient(SensorSettings settings, SensorClientListener* listener,
                 ReattachPolicy policy = ReattachPolicy());
    ~SensorClient();
    SensorClient(const SensorClient&) = delete;
    SensorClient& operator=(const SensorClient&) = delete;

    // Attaches to `service`: 0 and the client keeps the settings in force from now on, or the
    // result code of the call that failed (Open's -1, -19, ..., or kNotAttached), or
    // kNoThreadPool, with nothing left open. Only from kIdle (again after a failed Start).
    int32_t Start(std::shared_ptr<aidl::android::vyr::IVYRService> service);
    // Disables and closes the handle and ends the client's thread; the client stays stopped.
    void Stop();

    // PollOnce on the current handle: 0 with `event` filled, the service's result code, or
    // kNotAttached while re-attaching.
    int32_t Poll(aidl::android::vyr::Event* event);
    // The current handle, 0 when none is open.
    int32_t handle() const;
    State state() const;

  private:
    class Core;
    std::shared_ptr<Core> core_;
};

}  // namespace vyr
