// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#define LOG_TAG "vyrservice"

#include "client_process_watcher.h"

#include <log/log.h>
#include <sys/eventfd.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace android {
namespace vyr {
namespace binder {

namespace {

// How long the thread waits before it tries a failed poll again.
constexpr std::chrono::milliseconds kPollRetryDelay{100};

// Through syscall: older C libraries have no wrapper, every supported kernel has the call.
int PidfdOpen(pid_t pid) {
    return static_cast<int>(syscall(SYS_pidfd_open, pid, 0));
}

}  // namespace

ClientProcessWatcher::Syscalls ClientProcessWatcher::Syscalls::Real() {
    return Syscalls{&PidfdOpen, &::poll};
}

ClientProcessWatcher::ClientProcessWatcher(OnExit on_exit, Syscalls syscalls)
    : on_exit_(std::move(on_exit)),
      syscalls_(syscalls),
      wake_fd_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

ClientProcessWatcher::~ClientProcessWatcher() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        stopping_ = true;
    }
    stop_cv_.notify_all();
    Wake();
    if (thread_.joinable()) thread_.join();
}

std::optional<ClientProcessWatcher::ProcessId> ClientProcessWatcher::Watch(pid_t pid) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (wake_fd_.get() < 0) {
        ALOGE("%s cannot watch client process %d: no wake-up descriptor", __func__, pid);
        return std::nullopt;
    }
    auto current = current_.find(pid);
    if (current != current_.end()) {
        const Process& known = processes_.at(current->second);
        if (!HasEnded(known.pidfd.get())) return current->second;
        // The pid names a new process now; the thread reports the end of the old one.
        current_.erase(current);
    }
    base::unique_fd pidfd(syscalls_.pidfd_open(pid));
    if (pidfd.get() < 0 && errno != ESRCH) {
        ALOGE("%s cannot watch client process %d: %s", __func__, pid, strerror(errno));
        return std::nullopt;
    }
    const ProcessId id = next_id_++;
    // A process already gone (ESRCH) is kept without a descriptor and reported at once.
    if (pidfd.get() >= 0) current_[pid] = id;
    processes_.emplace(id, Process{pid, std::move(pidfd)});
    if (!thread_.joinable()) {
        thread_ = std::thread(&ClientProcessWatcher::Loop, this);
    } else {
        Wake();
    }
    return id;
}

void ClientProcessWatcher::Unwatch(ProcessId id) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = processes_.find(id);
    if (it != processes_.end()) {
        RetireLocked(it);
        Wake();
    }
}

bool ClientProcessWatcher::IsWatching(ProcessId id) {
    std::lock_guard<std::mutex> lock(mutex_);
    return processes_.count(id) != 0;
}

size_t ClientProcessWatcher::WatchedCount() {
    std::lock_guard<std::mutex> lock(mutex_);
    return processes_.size();
}

bool ClientProcessWatcher::HasEnded(int pidfd) const {
    if (pidfd < 0) return true;
    pollfd pfd{pidfd, POLLIN, 0};
    return syscalls_.poll(&pfd, 1, 0) == 1 && pfd.revents != 0;
}

void ClientProcessWatcher::RetireLocked(std::map<ProcessId, Process>::iterator it) {
    auto current = current_.find(it->second.pid);
    if (current != current_.end() && current->second == it->first) current_.erase(current);
    if (it->second.pidfd.get() >= 0) retired_.push_back(std::move(it->second.pidfd));
    processes_.erase(it);
}

bool ClientProcessWatcher::BackOff() {
    std::unique_lock<std::mutex> lock(mutex_);
    return !stop_cv_.wait_for(lock, kPollRetryDelay,
                              [this]() REQUIRES(mutex_) { return stopping_; });
}

void ClientProcessWatcher::Wake() {
    const uint64_t one = 1;
    // A full counter already wakes the thread; nothing else can fail here.
    (void)!write(wake_fd_.get(), &one, sizeof(one));
}

void ClientProcessWatcher::Loop() {
    int failures = 0;
    while (true) {
        std::vector<pollfd> fds;
        std::vector<ProcessId> ids;
        std::vector<std::pair<ProcessId, pid_t>> ended;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            if (stopping_) return;
            retired_.clear();
            fds.push_back({wake_fd_.get(), POLLIN, 0});
            for (auto it = processes_.begin(); it != processes_.end();) {
                const auto next = std::next(it);
                if (it->second.pidfd.get() < 0) {
                    ended.emplace_back(it->first, it->second.pid);
                    RetireLocked(it);
                } else {
                    fds.push_back({it->second.pidfd.get(), POLLIN, 0});
                    ids.push_back(it->first);
                }
                it = next;
            }
        }
        for (const auto& [id, pid] : ended) on_exit_(id, pid);
        if (!ended.empty()) continue;
        // Descriptors in this set stay open until the next round (Unwatch only retires them).
        if (syscalls_.poll(fds.data(), fds.size(), -1) < 0) {
            if (errno == EINTR) continue;
            // Tracking must go on: a watcher that ended here would leave every later client's
            // end unnoticed.
            if (failures++ == 0) {
                ALOGE("client process watcher: poll failed: %s; trying again", strerror(errno));
            }
            if (!BackOff()) return;
            continue;
        }
        if (failures != 0) {
            ALOGI("client process watcher: poll works again after %d failures", failures);
            failures = 0;
        }
        if (fds[0].revents != 0) {
            uint64_t count;
            (void)!read(wake_fd_.get(), &count, sizeof(count));
        }
        for (size_t i = 1; i < fds.size(); ++i) {
            if (fds[i].revents == 0) continue;
            pid_t pid = 0;
            {
                std::lock_guard<std::mutex> lock(mutex_);
                if (stopping_) return;
                // Unwatched meanwhile: its end is no longer wanted.
                auto it = processes_.find(ids[i - 1]);
                if (it == processes_.end()) continue;
                pid = it->second.pid;
                RetireLocked(it);
            }
            on_exit_(ids[i - 1], pid);
        }
    }
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
