// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "client_processes.h"

#include <android/binder_ibinder.h>
#include <unistd.h>

#include <algorithm>
#include <optional>
#include <utility>

namespace android {
namespace vyr {
namespace binder {

ClientProcesses::ClientProcesses(ClientProcessWatcher::OnExit on_exit)
    : watcher_(std::make_unique<ClientProcessWatcher>(std::move(on_exit))) {}

void ClientProcesses::NoteCaller(ClientEntry::Users* users) {
    NoteProcess(users, AIBinder_getCallingPid());
}

void ClientProcesses::NoteProcess(ClientEntry::Users* users, pid_t pid) {
    // The service's own process, and a oneway caller (pid 0), cannot be watched.
    if (pid <= 0 || pid == getpid() || watcher_ == nullptr) {
        users->unwatched = true;
        return;
    }
    const std::optional<ClientProcessWatcher::ProcessId> id = watcher_->Watch(pid);
    if (!id) {
        users->unwatched = true;
        return;
    }
    users->processes.emplace(*id, pid);
}

void ClientProcesses::Forget(const ClientEntry::Users& users, const ClientTable& clients) {
    if (watcher_ == nullptr) return;
    for (const auto& [id, pid] : users.processes) {
        const bool shared =
            std::any_of(clients.begin(), clients.end(), [id = id](const auto& client) {
                return client.second->users.processes.count(id) != 0;
            });
        if (!shared) watcher_->Unwatch(id);
    }
}

bool ClientProcesses::EndsLastUse(ClientEntry* entry, ClientProcessWatcher::ProcessId id) {
    if (entry->users.processes.erase(id) == 0) return false;
    return entry->users.processes.empty() && !entry->users.unwatched &&
           entry->death_recipient == nullptr;
}

size_t ClientProcesses::WatchedCount() {
    return watcher_ == nullptr ? 0 : watcher_->WatchedCount();
}

void ClientProcesses::Stop() {
    watcher_.reset();
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
