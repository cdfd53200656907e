// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_dump_state.h"

#include <map>
#include <utility>

namespace android {
namespace vyr {
namespace binder {
namespace {

using std::chrono::steady_clock;

int64_t AgeMs(steady_clock::time_point then) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(steady_clock::now() - then).count();
}

int64_t MonotonicMs(steady_clock::time_point time) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(time.time_since_epoch()).count();
}

}  // namespace

void ServiceDumpState::SetPresence(std::string light, std::string range) {
    light_presence_ = std::move(light);
    range_presence_ = std::move(range);
}

void ServiceDumpState::NoteDisplay(std::string status, const std::string& state) {
    std::lock_guard<std::mutex> lock(display_mutex_);
    display_status_ = std::move(status);
    if (!state.empty() || display_read_time_ != steady_clock::time_point()) {
        display_state_ = state;
        display_read_time_ = steady_clock::now();
    }
}

void ServiceDumpState::SetApexSection(std::function<DumpValue()> section) {
    std::lock_guard<std::mutex> lock(apex_mutex_);
    apex_section_ = std::move(section);
}

void ServiceDumpState::RecordEvent(std::string text) {
    events_.Record(std::move(text));
}

DumpValue ServiceDumpState::Sensors(bool light_enabled, bool low_power) const {
    DumpValue sensors = DumpValue::Object();
    DumpValue& light = sensors.Set("light", DumpValue::Object());
    light.Set("state", light_presence_);
    light.Set("enabled", light_enabled);
    light.Set("torch", torch_state_ >= 0 ? DumpValue(torch_state_.load()) : DumpValue());
    light.Set("low_power", low_power);
    DumpValue& range = sensors.Set("range", DumpValue::Object());
    range.Set("state", range_presence_);
    range.Set("initialized", range_initialized_.load());
    range.Set("enabled", range_enabled_.load());
    return sensors;
}

DumpValue ServiceDumpState::Display() const {
    std::lock_guard<std::mutex> lock(display_mutex_);
    DumpValue display = DumpValue::Object();
    display.Set("monitor", display_status_);
    const bool read = display_read_time_ != steady_clock::time_point();
    display.Set("last_state", read ? DumpValue(display_state_) : DumpValue());
    display.Set("last_read_age_ms", read ? DumpValue(AgeMs(display_read_time_)) : DumpValue());
    return display;
}

DumpValue ServiceDumpState::Apex() const {
    std::lock_guard<std::mutex> lock(apex_mutex_);
    return apex_section_ ? apex_section_() : DumpValue("no listener");
}

DumpValue ServiceDumpState::Events() const {
    DumpValue events = DumpValue::Array();
    for (const EventRing::Entry& entry : events_.Snapshot()) {
        DumpValue& shown = events.Append(DumpValue::Object());
        shown.Set("time_ms", MonotonicMs(entry.time));
        shown.Set("event", entry.text);
    }
    return events;
}

DumpValue ServiceDumpState::ModeBlock(ServiceModeParams& params, size_t index,
                                      int32_t display_handle) {
    DumpValue block = DumpValue::Object();
    block.Set("block", static_cast<int64_t>(index));
    block.Set("mode", params.mode.load());
    block.Set("running", params.running.load());
    block.Set("active_period_ms", params.active_period.load());
    {
        std::lock_guard<std::mutex> lock(params.dump.mutex);
        block.Set("enable_count", params.dump.enable_count);
        DumpValue& periods = block.Set("periods_ms", DumpValue::Object());
        const std::map<int32_t, int32_t> sorted(params.dump.periods.begin(),
                                                params.dump.periods.end());
        for (const auto& [handle, period] : sorted) {
            periods.Set(handle == display_handle ? "display" : std::to_string(handle), period);
        }
    }
    block.Set("samples", params.dump.samples.load());
    block.Set("invalid_samples", params.dump.invalid_samples.load());
    {
        // Held by the processing loop only while it stores a sample.
        std::lock_guard<std::mutex> lock(params.data_mutex);
        block.Set("ring_clients", params.feed.ring_clients);
        block.Set("ring_last_seq",
                  params.feed.ring ? DumpValue(params.feed.ring->last_seq()) : DumpValue());
    }
    const int64_t last = params.dump.last_sample_ns.load();
    block.Set("last_sample_age_ms",
              last == 0
                  ? DumpValue()
                  : DumpValue(AgeMs(steady_clock::time_point(std::chrono::nanoseconds(last)))));
    return block;
}

DumpValue ServiceDumpState::Clients(
    const std::unordered_map<int32_t, std::shared_ptr<ClientEntry>>& clients) {
    DumpValue shown = DumpValue::Array();
    const std::map<int32_t, std::shared_ptr<ClientEntry>> sorted(clients.begin(), clients.end());
    for (const auto& [handle, entry] : sorted) {
        DumpValue& client = shown.Append(DumpValue::Object());
        client.Set("handle", handle);
        client.Set("mode", entry->mode);
        client.Set("state", entry->state == kClientEnabled ? "enabled" : "disabled");
        client.Set("period_ms", entry->period);
        client.Set("callback", entry->callback != nullptr);
        const ClientEntry::Users& users = entry->users;
        client.Set("pid", users.opener_pid > 0 ? DumpValue(users.opener_pid) : DumpValue());
        DumpValue& processes = client.Set("processes", DumpValue::Array());
        for (const auto& [id, pid] : users.processes) processes.Append(pid);
        client.Set("unwatched_user", users.unwatched);
        client.Set("events_delivered", entry->counters.events_delivered.load());
        client.Set("polls_refused", entry->counters.polls_refused.load());
        client.Set("on_sample", entry->delivery.on_sample);
        client.Set("samples_dropped", entry->counters.samples_dropped->load());
        client.Set("ring", entry->delivery.ring);
    }
    return shown;
}

DumpValue ServiceDumpState::WorkQueues(const std::array<WorkQueue, 2>& queues) {
    DumpValue shown = DumpValue::Array();
    for (unsigned int sensor_type = 0; sensor_type < queues.size(); ++sensor_type) {
        const WorkQueue& queue = queues[sensor_type];
        DumpValue& entry = shown.Append(DumpValue::Object());
        entry.Set("sensor_type", sensor_type);
        entry.Set("depth", static_cast<uint64_t>(queue.Depth()));
        entry.Set("highest_depth", static_cast<uint64_t>(queue.HighestDepth()));
        entry.Set("applied", queue.Applied());
    }
    return shown;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
