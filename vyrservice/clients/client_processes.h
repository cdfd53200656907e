// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <unordered_map>

#include "client_entry.h"
#include "client_process_watcher.h"

namespace android {
namespace vyr {
namespace binder {

// Which processes use each handle, so that a handle whose users have all ended is released as a
// death notice would release it, also when no callback was ever linked. The callers hold the
// service's API lock, which guards the entries; the watcher has its own.
class ClientProcesses {
  public:
    using ClientTable = std::unordered_map<int32_t, std::shared_ptr<ClientEntry>>;

    // `on_exit` runs on the watcher's thread, once per watched process that ends.
    explicit ClientProcesses(ClientProcessWatcher::OnExit on_exit);

    // Adds the caller of the current binder method to the users of the entry.
    void NoteCaller(ClientEntry::Users* users);
    void NoteProcess(ClientEntry::Users* users, pid_t pid);
    // Stops watching the processes of a client that left `clients`, unless another client's
    // handle is used by them too.
    void Forget(const ClientEntry::Users& users, const ClientTable& clients);
    // Takes the ended process off the entry's users; true when that leaves the handle to be
    // released: no user left that could still be using it, and no linked callback, whose death
    // notice alone releases its handle.
    static bool EndsLastUse(ClientEntry* entry, ClientProcessWatcher::ProcessId id);
    // Processes watched and not yet reported ended.
    size_t WatchedCount();
    // Stops and joins the watcher: no process end is reported after this returns.
    void Stop();

  private:
    std::unique_ptr<ClientProcessWatcher> watcher_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
