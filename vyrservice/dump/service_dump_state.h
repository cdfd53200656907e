// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <unordered_map>

#include "client_entry.h"
#include "dump_value.h"
#include "event_ring.h"
#include "service_mode_params.h"
#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

// What the service keeps only to show it in its dump, and the builders of the dump's sections.
// Every note is cheap and takes at most a lock of its own held briefly, so the threads that make
// them never wait for a dump.
class ServiceDumpState {
  public:
    // Why each sensor is absent ("present" when it is not); fixed before any thread starts.
    void SetPresence(std::string light, std::string range);
    // The range sensor's power as the worker left it.
    void NoteRangeInitialized(bool initialized) { range_initialized_ = initialized; }
    void NoteRangeEnabled(bool enabled) { range_enabled_ = enabled; }
    // The last torch state passed on to the light sensor.
    void NoteTorch(int32_t state) { torch_state_ = state; }
    // What the display monitor is doing, and the state it last read (empty: nothing read).
    void NoteDisplay(std::string status, const std::string& state) EXCLUDES(display_mutex_);
    // What the dump shows of the APEX update listener, which the process owns beside the service.
    void SetApexSection(std::function<DumpValue()> section) EXCLUDES(apex_mutex_);
    // Adds an entry to the list of recent events.
    void RecordEvent(std::string text);

    DumpValue Sensors(bool light_enabled, bool low_power) const;
    DumpValue Display() const EXCLUDES(display_mutex_);
    DumpValue Apex() const EXCLUDES(apex_mutex_);
    DumpValue Events() const;

    // Block `index`; the display's own handle is shown as "display".
    static DumpValue ModeBlock(ServiceModeParams& params, size_t index, int32_t display_handle);
    // The client table, by handle; its caller holds the API lock.
    static DumpValue Clients(
        const std::unordered_map<int32_t, std::shared_ptr<ClientEntry>>& clients);
    static DumpValue WorkQueues(const std::array<WorkQueue, 2>& queues);

  private:
    std::string light_presence_ = "not created";
    std::string range_presence_ = "not created";
    std::atomic<bool> range_initialized_{false};
    std::atomic<bool> range_enabled_{false};
    // -1 before any.
    std::atomic<int32_t> torch_state_{-1};
    mutable std::mutex display_mutex_;
    std::string display_status_ GUARDED_BY(display_mutex_) = "not started";
    std::string display_state_ GUARDED_BY(display_mutex_);
    std::chrono::steady_clock::time_point display_read_time_ GUARDED_BY(display_mutex_);
    mutable std::mutex apex_mutex_;
    std::function<DumpValue()> apex_section_ GUARDED_BY(apex_mutex_);
    EventRing events_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
