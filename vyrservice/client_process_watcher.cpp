#include "client_process_watcher.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <utility>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

namespace {

// Through syscall: older C libraries have no wrapper, every supported kernel has the call.
int PidfdOpen(pid_t pid) {
    return static_cast<int>(syscall(SYS_pidfd_open, pid, 0));
}

}  // namespace

ClientProcessWatcher::ClientProcessWatcher(OnExit on_exit)
    : on_exit_(std::move(on_exit)), wake_fd_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

ClientProcessWatcher::~ClientProcessWatcher() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        stopping_ = true;
    }
    Wake();
    if (thread_.joinable()) thread_.join();
}

bool ClientProcessWatcher::Watch(pid_t pid) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (pidfds_.count(pid) != 0) return true;
    if (wake_fd_.get() < 0) return false;
    base::unique_fd pidfd(PidfdOpen(pid));
    if (pidfd.get() >= 0) {
        pidfds_.emplace(pid, std::move(pidfd));
    } else if (errno == ESRCH) {
        gone_.push_back(pid);
    } else {
        return false;
    }
    if (!thread_.joinable()) {
        thread_ = std::thread(&ClientProcessWatcher::Loop, this);
    } else {
        Wake();
    }
    return true;
}

void ClientProcessWatcher::Unwatch(pid_t pid) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = pidfds_.find(pid);
    if (it != pidfds_.end()) {
        retired_.push_back(std::move(it->second));
        pidfds_.erase(it);
        Wake();
    }
    gone_.erase(std::remove(gone_.begin(), gone_.end(), pid), gone_.end());
}

bool ClientProcessWatcher::IsWatching(pid_t pid) {
    std::lock_guard<std::mutex> lock(mutex_);
    return pidfds_.count(pid) != 0 || std::find(gone_.begin(), gone_.end(), pid) != gone_.end();
}

void ClientProcessWatcher::Wake() {
    const uint64_t one = 1;
    // A full counter already wakes the thread; nothing else can fail here.
    (void)!write(wake_fd_.get(), &one, sizeof(one));
}

void ClientProcessWatcher::Loop() {
    while (true) {
        std::vector<pollfd> fds;
        std::vector<pid_t> pids;
        std::vector<pid_t> gone;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            if (stopping_) return;
            retired_.clear();
            gone.swap(gone_);
            fds.push_back({wake_fd_.get(), POLLIN, 0});
            for (const auto& [pid, pidfd] : pidfds_) {
                fds.push_back({pidfd.get(), POLLIN, 0});
                pids.push_back(pid);
            }
        }
        for (pid_t pid : gone) on_exit_(pid);
        if (!gone.empty()) continue;
        // Descriptors in this set stay open until the next round (Unwatch only retires them).
        if (poll(fds.data(), fds.size(), -1) < 0 && errno != EINTR) return;
        if (fds[0].revents != 0) {
            uint64_t count;
            (void)!read(wake_fd_.get(), &count, sizeof(count));
        }
        for (size_t i = 1; i < fds.size(); ++i) {
            if (fds[i].revents == 0) continue;
            const pid_t pid = pids[i - 1];
            {
                std::lock_guard<std::mutex> lock(mutex_);
                if (stopping_) return;
                // Unwatched meanwhile, or watched anew: not the process this poll watched.
                auto it = pidfds_.find(pid);
                if (it == pidfds_.end() || it->second.get() != fds[i].fd) continue;
                retired_.push_back(std::move(it->second));
                pidfds_.erase(it);
            }
            on_exit_(pid);
        }
    }
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
