// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service's dump: what `dumpsys vyrservice` and `vyrctl dump` show.

#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "vyrservice.h"

namespace android {
namespace vyr {
namespace binder {
namespace {

using std::chrono::steady_clock;

// The longest the dump waits for the API lock: it must never hold up the service for long, nor
// run into the lock's fatal limit. Every other lock it takes is only ever held briefly.
constexpr std::chrono::milliseconds kLockWait{1000};

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
    dump_state_.RecordEvent(std::move(text));
}

void VYRService::SetApexSection(std::function<DumpValue()> section) {
    dump_state_.SetApexSection(std::move(section));
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
    dump.Set("sensors", dump_state_.Sensors(als_sensor_ != nullptr && als_sensor_->enabled.load(),
                                            low_power_.load()));
    DumpValue& modes = dump.Set("modes", DumpValue::Array());
    for (size_t index = 0; index < mode_params_.size(); ++index) {
        modes.Append(ServiceDumpState::ModeBlock(mode_params_[index], index, display_handle_));
    }
    dump.Set("clients", std::move(clients));
    dump.Set("watched_processes", static_cast<uint64_t>(client_processes_.WatchedCount()));
    dump.Set("work_queues", ServiceDumpState::WorkQueues(work_queues_));
    dump.Set("display", dump_state_.Display());
    dump.Set("apex", dump_state_.Apex());
    dump.Set("events", dump_state_.Events());
    return dump;
}

DumpValue VYRService::DumpClientsLocked() const {
    return ServiceDumpState::Clients(clients_);
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
