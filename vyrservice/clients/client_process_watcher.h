// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>
#include <android-base/unique_fd.h>
#include <poll.h>
#include <sys/types.h>

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

// Tells when a client process ends, whether or not it ever passed a binder that could be linked
// to death: a poll-only client, or one killed before SetCallback, would otherwise keep its sensor
// running and its table slot for ever. Each process is known by an id of its own, watched through
// a pidfd that names that one process and never a later one with the same pid; one thread,
// started by the first Watch, waits on them all.
class ClientProcessWatcher {
  public:
    // Never reused within one watcher, unlike pids.
    using ProcessId = uint64_t;
    using OnExit = std::function<void(ProcessId, pid_t)>;

    // The system calls the watcher makes, replaceable so that tests can make them fail.
    struct Syscalls {
        int (*pidfd_open)(pid_t pid);
        int (*poll)(pollfd* fds, nfds_t count, int timeout_ms);
        static Syscalls Real();
    };

    // `on_exit` runs on the watcher's thread, once per watched process that ends.
    explicit ClientProcessWatcher(OnExit on_exit, Syscalls syscalls = Syscalls::Real());
    // Stops and joins the thread; no `on_exit` runs after this returns.
    ~ClientProcessWatcher();
    ClientProcessWatcher(const ClientProcessWatcher&) = delete;
    ClientProcessWatcher& operator=(const ClientProcessWatcher&) = delete;

    // The id of the process that now runs as `pid`, watched from now on: the id it already has
    // while that process lives, a new one once it has ended and the pid names another. A process
    // already gone gets an id that is reported ended as soon as the thread runs. Empty (and
    // logged) if the process cannot be watched.
    std::optional<ProcessId> Watch(pid_t pid) EXCLUDES(mutex_);
    // Stops watching; its end is not reported.
    void Unwatch(ProcessId id) EXCLUDES(mutex_);
    bool IsWatching(ProcessId id) EXCLUDES(mutex_);
    // Processes watched and not yet reported ended.
    size_t WatchedCount() EXCLUDES(mutex_);

  private:
    struct Process {
        pid_t pid;
        // Not valid for a process that was gone before it could be opened.
        base::unique_fd pidfd;
    };

    void Loop();
    void Wake();
    // Whether the process behind a pidfd has ended; a failed check counts as alive.
    bool HasEnded(int pidfd) const;
    // Forgets the process, its descriptor kept until the thread's next round.
    void RetireLocked(std::map<ProcessId, Process>::iterator it) REQUIRES(mutex_);
    // Waits before a failed poll is tried again; false when the watcher stops meanwhile.
    bool BackOff() EXCLUDES(mutex_);

    const OnExit on_exit_;
    const Syscalls syscalls_;
    std::mutex mutex_;
    std::condition_variable stop_cv_;
    std::map<ProcessId, Process> processes_ GUARDED_BY(mutex_);
    // The live process of each pid, for Watch.
    std::map<pid_t, ProcessId> current_ GUARDED_BY(mutex_);
    ProcessId next_id_ GUARDED_BY(mutex_) = 1;
    // No longer watched, closed by the thread between two polls: closing one that a poll still
    // waits on would let its number name another file in that poll.
    std::vector<base::unique_fd> retired_ GUARDED_BY(mutex_);
    bool stopping_ GUARDED_BY(mutex_) = false;
    // Written to wake the thread when the set changes or it must stop.
    base::unique_fd wake_fd_;
    std::thread thread_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
