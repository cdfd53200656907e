// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service's dump: what `dumpsys vyrservice` and `vyrctl dump` show.

#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <map>

#include "vyrservice.h"

namespace android {
namespace vyr {
namespace binder {
namespace {

using std::chrono::steady_clock;

// The longest the dump waits for the API lock: it must never hold up the service for long, nor
// run into the lock's fatal limit. Every other lock it takes is only ever held briefly.
constexpr std::chrono::milliseconds kLockWait{1000};

int64_t AgeMs(steady_clock::time_point then) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(steady_clock::now() - then).count();
}

int64_t MonotonicMs(steady_clock::time_point time) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(time.time_since_epoch()).count();
}

bool WriteAll(int fd, const std::string& text) {
    size_t written = 0;
    while (written < text.size()) {
        const ssize_t n = write(fd, text.data() + written, text.size() - written);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) return false;
        written += static_cast<size_t>(n);
    }
    return true;
}

}  // namespace

binder_status_t VYRService::dump(int fd, const char** args, uint32_t num_args) {
    bool json = false;
    for (uint32_t i = 0; i < num_args; ++i) {
        if (args[i] != nullptr && strcmp(args[i], "--json") == 0) json = true;
    }
    const DumpValue dump = BuildDump(steady_clock::now() + kLockWait);
    // Written with no lock held: a reader that is slow or gone holds up nobody.
    if (!WriteAll(fd, json ? dump.ToJson() + "\n" : dump.ToText())) return -errno;
    return STATUS_OK;
}

void VYRService::RecordEvent(std::string text) {
    events_.Record(std::move(text));
}

void VYRService::SetApexSection(std::function<DumpValue()> section) {
    std::lock_guard<std::mutex> lock(apex_mutex_);
    apex_section_ = std::move(section);
}

void VYRService::NoteDisplayState(std::string status, const std::string& state) {
    std::lock_guard<std::mutex> lock(display_mutex_);
    display_status_ = std::move(status);
    if (!state.empty() || display_read_time_ != steady_clock::time_point()) {
        display_state_ = state;
        display_read_time_ = steady_clock::now();
    }
}

DumpValue VYRService::BuildDump(steady_clock::time_point deadline) {
    DumpValue dump = DumpValue::Object();
    // First, so that a reader sees at once whether the client table could be read.
    DumpValue& api_lock = dump.Set("api_lock", "taken");
    DumpValue clients;
    {
        if (api_lock_.TryLockFor(deadline - steady_clock::now())) {
            clients = DumpClientsLocked();
            api_lock_.Unlock();
        } else {
            api_lock = "busy for " + std::to_string(kLockWait.count()) +
                       " ms: clients not shown, the rest as read without it";
        }
    }
    dump.Set("sensors", DumpSensors());
    DumpValue& modes = dump.Set("modes", DumpValue::Array());
    for (size_t index = 0; index < mode_params_.size(); ++index) {
        modes.Append(DumpModeBlock(index));
    }
    dump.Set("clients", std::move(clients));
    dump.Set("watched_processes", static_cast<uint64_t>(process_watcher_->WatchedCount()));
    dump.Set("work_queues", DumpWorkQueues());
    dump.Set("display", DumpDisplay());
    {
        std::lock_guard<std::mutex> lock(apex_mutex_);
        dump.Set("apex", apex_section_ ? apex_section_() : DumpValue("no listener"));
    }
    dump.Set("events", DumpEvents());
    return dump;
}

DumpValue VYRService::DumpSensors() const {
    DumpValue sensors = DumpValue::Object();
    DumpValue& light = sensors.Set("light", DumpValue::Object());
    light.Set("state", als_presence_);
    light.Set("enabled", als_sensor_ != nullptr && als_sensor_->enabled.load());
    light.Set("torch", torch_state_ >= 0 ? DumpValue(torch_state_.load()) : DumpValue());
    light.Set("low_power", low_power_.load());
    DumpValue& range = sensors.Set("range", DumpValue::Object());
    range.Set("state", range_presence_);
    range.Set("initialized", range_initialized_.load());
    range.Set("enabled", range_enabled_.load());
    return sensors;
}

DumpValue VYRService::DumpModeBlock(size_t index) {
    ServiceModeParams& params = mode_params_[index];
    DumpValue block = DumpValue::Object();
    block.Set("block", static_cast<int64_t>(index));
    block.Set("mode", params.mode.load());
    block.Set("running", params.running.load());
    block.Set("active_period_ms", params.active_period.load());
    {
        std::lock_guard<std::mutex> lock(params.shown_mutex);
        block.Set("enable_count", params.shown_enable_count);
        DumpValue& periods = block.Set("periods_ms", DumpValue::Object());
        const std::map<int32_t, int32_t> sorted(params.shown_periods.begin(),
                                                params.shown_periods.end());
        for (const auto& [handle, period] : sorted) {
            periods.Set(handle == display_handle_ ? "display" : std::to_string(handle), period);
        }
    }
    block.Set("samples", params.samples.load());
    block.Set("invalid_samples", params.invalid_samples.load());
    const int64_t last = params.last_sample_ns.load();
    block.Set("last_sample_age_ms",
              last == 0
                  ? DumpValue()
                  : DumpValue(AgeMs(steady_clock::time_point(std::chrono::nanoseconds(last)))));
    return block;
}

DumpValue VYRService::DumpClientsLocked() const {
    DumpValue clients = DumpValue::Array();
    const std::map<int32_t, std::shared_ptr<ClientEntry>> sorted(clients_.begin(), clients_.end());
    for (const auto& [handle, entry] : sorted) {
        DumpValue& client = clients.Append(DumpValue::Object());
        client.Set("handle", handle);
        client.Set("mode", entry->mode);
        client.Set("state", entry->state == kClientEnabled ? "enabled" : "disabled");
        client.Set("period_ms", entry->period);
        client.Set("callback", entry->callback != nullptr);
        client.Set("pid", entry->opener_pid > 0 ? DumpValue(entry->opener_pid) : DumpValue());
        DumpValue& processes = client.Set("processes", DumpValue::Array());
        for (const auto& [id, pid] : entry->processes) processes.Append(pid);
        client.Set("unwatched_user", entry->unwatched_user);
        client.Set("events_delivered", entry->events_delivered.load());
        client.Set("polls_refused", entry->polls_refused.load());
        client.Set("on_sample", entry->on_sample);
        client.Set("samples_dropped", entry->samples_dropped->load());
    }
    return clients;
}

DumpValue VYRService::DumpWorkQueues() {
    DumpValue queues = DumpValue::Array();
    for (unsigned int sensor_type = 0; sensor_type < work_queues_.size(); ++sensor_type) {
        const WorkQueue& queue = work_queues_[sensor_type];
        DumpValue& shown = queues.Append(DumpValue::Object());
        shown.Set("sensor_type", sensor_type);
        shown.Set("depth", static_cast<uint64_t>(queue.Depth()));
        shown.Set("highest_depth", static_cast<uint64_t>(queue.HighestDepth()));
        shown.Set("applied", queue.Applied());
    }
    return queues;
}

DumpValue VYRService::DumpDisplay() const {
    std::lock_guard<std::mutex> lock(display_mutex_);
    DumpValue display = DumpValue::Object();
    display.Set("monitor", display_status_);
    const bool read = display_read_time_ != steady_clock::time_point();
    display.Set("last_state", read ? DumpValue(display_state_) : DumpValue());
    display.Set("last_read_age_ms", read ? DumpValue(AgeMs(display_read_time_)) : DumpValue());
    return display;
}

DumpValue VYRService::DumpEvents() const {
    DumpValue events = DumpValue::Array();
    for (const EventRing::Entry& entry : events_.Snapshot()) {
        DumpValue& shown = events.Append(DumpValue::Object());
        shown.Set("time_ms", MonotonicMs(entry.time));
        shown.Set("event", entry.text);
    }
    return events;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
