// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "looper.h"

#include <pthread.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <utility>

#include "connection.h"
#include "unique_lock.h"

namespace vyr_binder {
namespace {

constexpr uint64_t kWorkTag = UINT64_MAX;
constexpr uint64_t kStopTag = UINT64_MAX - 1;

thread_local bool t_runtime_thread = false;

}  // namespace

Looper::Looper()
    : epoll_fd_(epoll_create1(EPOLL_CLOEXEC)),
      work_fd_(eventfd(1, EFD_CLOEXEC)),
      stop_fd_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    Control(EPOLL_CTL_ADD, work_fd_, EPOLLONESHOT, kWorkTag);
    Control(EPOLL_CTL_ADD, stop_fd_, EPOLLIN, kStopTag);
}

void Looper::Control(int op, int fd, uint32_t events, uint64_t tag) {
    epoll_event event{};
    event.events = events;
    event.data.u64 = tag;
    epoll_ctl(epoll_fd_, op, fd, &event);
}

bool Looper::OnRuntimeThread() {
    return t_runtime_thread;
}

void Looper::SpawnLocked(Kind kind) {
    ++spawned_;
    const uint32_t number = ++threads_named_;
    threads_.emplace_back([this, kind, number] {
        // As a device names its binder threads, so that they can be told apart in ps and top.
        char name[16];
        snprintf(name, sizeof(name), "binder:%d_%X", static_cast<int>(getpid()), number);
        pthread_setname_np(pthread_self(), name);
        Run(kind);
    });
}

void Looper::ArmWorkLocked() {
    Control(EPOLL_CTL_MOD, work_fd_, EPOLLIN | EPOLLONESHOT, kWorkTag);
}

void Looper::StartPool() {
    std::lock_guard<std::mutex> lock(mutex_);
    if (started_ || stopping_) return;
    started_ = true;
    // The looper is the pool's first thread.
    if (!looper_running_) {
        looper_running_ = true;
        SpawnLocked(Kind::kLooper);
    }
    if (!queue_.empty()) ArmWorkLocked();
}

bool Looper::IsStarted() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return started_;
}

bool Looper::SetMaxThreads(uint32_t max_threads) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (started_) return false;
    max_threads_ = max_threads == 0 ? 1 : max_threads;
    return true;
}

void Looper::Join() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (stopping_) return;
        ++joined_;
        if (!queue_.empty()) ArmWorkLocked();
    }
    Run(Kind::kJoined);
    std::lock_guard<std::mutex> lock(mutex_);
    --joined_;
    cv_.notify_all();
}

void Looper::Enqueue(std::function<void()> work) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (stopping_) return;
    queue_.push_back(std::move(work));
    if (!HaveExecutorsLocked()) return;
    ArmWorkLocked();
    SpawnIfAllBusyLocked();
}

void Looper::SpawnIfAllBusyLocked() {
    // Counting busy threads, not waiting ones: a thread that just replied is about to wait again.
    if (started_ && !stopping_ && serving_ >= ExecutorsLocked() && spawned_ < max_threads_) {
        SpawnLocked(Kind::kPool);
    }
}

void Looper::BeforeServingInline() {
    std::lock_guard<std::mutex> lock(mutex_);
    ++serving_;
    SpawnIfAllBusyLocked();
}

void Looper::AfterServingInline() {
    std::lock_guard<std::mutex> lock(mutex_);
    --serving_;
}

void Looper::RunTask(std::function<void()> task) {
    std::lock_guard<std::mutex> lock(mutex_);
    // Tasks are rare (a peer that does not take what is sent to it); reap the finished ones.
    for (auto it = tasks_.begin(); it != tasks_.end();) {
        if (*it->second) {
            it->first.join();
            it = tasks_.erase(it);
        } else {
            ++it;
        }
    }
    auto done = std::make_shared<bool>(false);
    tasks_.emplace_back(std::thread([this, task = std::move(task), done] {
                            t_runtime_thread = true;
                            task();
                            std::lock_guard<std::mutex> lock(mutex_);
                            *done = true;
                        }),
                        done);
}

void Looper::Run(Kind kind) {
    t_runtime_thread = true;
    UniqueLock lock(mutex_);
    while (!stopping_) {
        const bool executor = kind != Kind::kLooper || started_;
        if (executor && !queue_.empty()) {
            std::function<void()> work = std::move(queue_.front());
            queue_.pop_front();
            if (!queue_.empty()) {
                ArmWorkLocked();
            } else {
                cv_.notify_all();  // Shutdown waits for the queue to empty
            }
            ++serving_;
            lock.unlock();
            work();
            work = nullptr;
            lock.lock();
            --serving_;
            continue;
        }
        // Every idle thread waits in epoll. Its waiters are woken one per event, the one that
        // began waiting last first: the thread that served the last call serves the next, and
        // an idle process has no thread that wakes.
        if (executor) ++idle_executors_;
        lock.unlock();
        epoll_event event{};
        int n = epoll_wait(epoll_fd_, &event, 1, -1);
        lock.lock();
        if (executor) --idle_executors_;
        // epoll_event is packed on x86-64: copy the tag out before binding a reference to it.
        uint64_t tag = event.data.u64;
        if (n <= 0 || tag == kStopTag) continue;
        if (tag == kWorkTag) {
            // Only an executor takes work. Anyone else passes the wake-up on to an idle executor
            // (waiters are woken oldest first, so not back to itself); busy executors look at
            // the queue anyway before they wait again.
            bool can_take = kind != Kind::kLooper || started_;
            if (!can_take && !queue_.empty() && idle_executors_ > 0) ArmWorkLocked();
            continue;
        }
        auto it = connections_.find(tag);
        if (it == connections_.end()) continue;
        std::shared_ptr<Connection> connection = it->second;
        bool can_serve = kind != Kind::kLooper || started_;
        lock.unlock();
        connection->OnReadable(can_serve, (event.events & (EPOLLRDHUP | EPOLLHUP | EPOLLERR)) != 0);
        connection.reset();
        lock.lock();
    }
    // A thread that joined the pool goes back to being an ordinary thread.
    if (kind == Kind::kJoined) t_runtime_thread = false;
}

void Looper::Add(const std::shared_ptr<Connection>& connection) {
    std::lock_guard<std::mutex> lock(mutex_);
    uint64_t serial = next_serial_++;
    connection->set_serial(serial);
    connections_[serial] = connection;
    if (!looper_running_) {
        looper_running_ = true;
        SpawnLocked(Kind::kLooper);
    }
    Control(EPOLL_CTL_ADD, connection->fd(), EPOLLONESHOT, serial);
}

void Looper::Remove(const Connection& connection) {
    std::shared_ptr<Connection> removed;
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = connections_.find(connection.serial());
    if (it == connections_.end()) return;
    removed = std::move(it->second);
    connections_.erase(it);
    Control(EPOLL_CTL_DEL, connection.fd(), 0, 0);
    cv_.notify_all();
    // `removed` may hold the last reference; it is released after the lock.
}

void Looper::Arm(const Connection& connection, bool input) {
    const uint32_t events = (input ? uint32_t{EPOLLIN} : 0u) | EPOLLRDHUP | EPOLLET;
    Control(EPOLL_CTL_MOD, connection.fd(), events, connection.serial());
}

void Looper::Disarm(const Connection& connection) {
    Control(EPOLL_CTL_MOD, connection.fd(), EPOLLONESHOT, connection.serial());
}

std::vector<std::shared_ptr<Connection>> Looper::Connections() {
    std::lock_guard<std::mutex> lock(mutex_);
    std::vector<std::shared_ptr<Connection>> all;
    for (const auto& entry : connections_) all.push_back(entry.second);
    return all;
}

void Looper::WaitForNoConnections() {
    UniqueLock lock(mutex_);
    cv_.wait(lock.native(), [this]() REQUIRES(mutex_) { return connections_.empty(); });
}

void Looper::Shutdown() {
    std::vector<std::thread> threads;
    std::vector<std::pair<std::thread, std::shared_ptr<bool>>> tasks;
    std::deque<std::function<void()>> dropped;
    {
        UniqueLock lock(mutex_);
        // Queued work, death notices among it, is done first when a pool thread can do it;
        // without a pool it is dropped, as a device process that never had one never saw it.
        cv_.wait(lock.native(),
                 [this]() REQUIRES(mutex_) { return queue_.empty() || !HaveExecutorsLocked(); });
        stopping_ = true;
        uint64_t one = 1;
        ssize_t written = write(stop_fd_, &one, sizeof(one));
        (void)written;
        threads.swap(threads_);
        tasks.swap(tasks_);
        dropped.swap(queue_);
    }
    for (std::thread& thread : threads) thread.join();
    for (auto& task : tasks) task.first.join();
    dropped.clear();
    UniqueLock lock(mutex_);
    cv_.wait(lock.native(), [this]() REQUIRES(mutex_) { return joined_ == 0; });
    uint64_t value;
    if (read(stop_fd_, &value, sizeof(value)) < 0) value = 0;
    queue_.clear();
    spawned_ = 0;
    serving_ = 0;
    looper_running_ = false;
    started_ = false;
    stopping_ = false;
}

}  // namespace vyr_binder
