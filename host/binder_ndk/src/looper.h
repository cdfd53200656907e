// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

namespace vyr_binder {

class Connection;

// The process's binder threads and the epoll set of its connections.
//
// Runtime threads wait in one epoll set; the one woken for a connection reads one frame, lets
// the next reader in, and then serves a call in that frame itself, so a call costs no hand-over
// between threads. Idle threads all wait in epoll, which wakes the one that began waiting last:
// the thread that served the last call serves the next one, warm, instead of the pool taking
// turns, and no thread wakes while nothing happens. The looper
// thread exists from the first connection on; until the pool is started (or a thread joins it) it
// handles replies and reference counts but leaves incoming calls, death notices and registration
// notices queued, as a device process without a thread pool would.
class Looper {
  public:
    static constexpr uint32_t kDefaultMaxThreads = 15;

    Looper();
    Looper(const Looper&) = delete;
    Looper& operator=(const Looper&) = delete;

    void StartPool();
    bool IsStarted() const;
    bool SetMaxThreads(uint32_t max_threads);
    // Serves until Shutdown.
    void Join();
    // Runs `work` on a pool thread, once there is one.
    void Enqueue(std::function<void()> work);
    // Bracket a call a pool thread serves itself; when every pool thread is busy serving,
    // another is started so that someone still reads.
    void BeforeServingInline();
    void AfterServingInline();
    // Runs `task` on a runtime thread of its own now, pool or not (the runtime's own sending).
    void RunTask(std::function<void()> task);

    // Adds the connection disarmed; the connection arms itself.
    void Add(const std::shared_ptr<Connection>& connection);
    void Remove(const Connection& connection);
    // Wakes one waiting thread each time data arrives on the connection (`input`), or only when
    // the peer hangs up; Disarm stops both. Arming wakes a thread at once for what is already
    // there.
    void Arm(const Connection& connection, bool input);
    void Disarm(const Connection& connection);
    std::vector<std::shared_ptr<Connection>> Connections();
    void WaitForNoConnections();

    // Stops and joins every thread; queued work is dropped. Everything works again after.
    void Shutdown();

    // Readable while the runtime shuts down: a task that waits on something else waits on this
    // too.
    int stop_fd() const { return stop_fd_; }

    // True on the looper, pool and joined threads.
    static bool OnRuntimeThread();

  private:
    enum class Kind { kLooper, kPool, kJoined };

    void Run(Kind kind);
    void SpawnLocked(Kind kind) REQUIRES(mutex_);
    void ArmWorkLocked() REQUIRES(mutex_);
    bool HaveExecutorsLocked() const REQUIRES(mutex_) { return started_ || joined_ > 0; }
    uint32_t ExecutorsLocked() const REQUIRES(mutex_) {
        return (started_ ? spawned_ : 0) + joined_;
    }
    void SpawnIfAllBusyLocked() REQUIRES(mutex_);
    void Control(int op, int fd, uint32_t events, uint64_t tag);

    const int epoll_fd_;
    const int work_fd_;  // always readable; armed one-shot while work is queued
    const int stop_fd_;  // readable while stopping, waking every thread

    mutable std::mutex mutex_;
    std::condition_variable cv_;
    std::deque<std::function<void()>> queue_ GUARDED_BY(mutex_);
    std::vector<std::thread> threads_ GUARDED_BY(mutex_);
    std::vector<std::pair<std::thread, std::shared_ptr<bool>>> tasks_ GUARDED_BY(mutex_);
    std::map<uint64_t, std::shared_ptr<Connection>> connections_ GUARDED_BY(mutex_);
    uint64_t next_serial_ GUARDED_BY(mutex_) = 1;
    uint32_t max_threads_ GUARDED_BY(mutex_) = kDefaultMaxThreads;
    uint32_t spawned_ GUARDED_BY(mutex_) = 0;
    uint32_t threads_named_ GUARDED_BY(mutex_) = 0;   // for the threads' names, never reused
    uint32_t idle_executors_ GUARDED_BY(mutex_) = 0;  // waiting in epoll
    uint32_t serving_ GUARDED_BY(mutex_) = 0;         // running a call or queued work
    uint32_t joined_ GUARDED_BY(mutex_) = 0;
    bool looper_running_ GUARDED_BY(mutex_) = false;
    bool started_ GUARDED_BY(mutex_) = false;
    bool stopping_ GUARDED_BY(mutex_) = false;
};

}  // namespace vyr_binder
