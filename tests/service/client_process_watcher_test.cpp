// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The watcher that tells the service when a client process has ended.

#include "client_process_watcher.h"

#include <android/log.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <map>
#include <mutex>
#include <utility>
#include <vector>

#include "child_process.h"
#include "log_capture.h"
#include "temp_dir.h"
#include "thread_count.h"

namespace vyr_test::service {
namespace {

using android::vyr::binder::ClientProcessWatcher;
using ProcessId = ClientProcessWatcher::ProcessId;
using std::chrono::milliseconds;

constexpr milliseconds kWait{5000};
constexpr char kTag[] = "vyrservice";

// The processes reported ended, in order.
class Exits {
  public:
    ClientProcessWatcher::OnExit Recorder() {
        return [this](ProcessId id, pid_t pid) {
            std::lock_guard<std::mutex> lock(mutex_);
            reports_.emplace_back(id, pid);
            changed_.notify_all();
        };
    }
    bool WaitFor(ProcessId id) {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kWait, [&] { return CountLocked(id) > 0; });
    }
    size_t Count(ProcessId id) {
        std::lock_guard<std::mutex> lock(mutex_);
        return CountLocked(id);
    }
    // The pid reported with `id`; 0 if it was not reported.
    pid_t PidOf(ProcessId id) {
        std::lock_guard<std::mutex> lock(mutex_);
        for (const auto& [reported, pid] : reports_) {
            if (reported == id) return pid;
        }
        return 0;
    }

  private:
    size_t CountLocked(ProcessId id) const {
        size_t count = 0;
        for (const auto& report : reports_) count += report.first == id;
        return count;
    }
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<std::pair<ProcessId, pid_t>> reports_;
};

int RealPidfdOpen(pid_t pid) {
    return static_cast<int>(syscall(SYS_pidfd_open, pid, 0));
}

// System calls that tests make fail or point elsewhere. Plain globals: the watcher takes plain
// function pointers.
std::atomic<int> g_poll_failures{0};
std::atomic<int> g_pidfd_failures{0};
std::mutex g_pid_mutex;
// A pid that pidfd_open resolves to another one: the same number naming a new process.
std::map<pid_t, pid_t> g_pid_alias;

int FailingPoll(pollfd* fds, nfds_t count, int timeout_ms) {
    // Only the thread's waits fail; the quick checks of Watch are left alone.
    if (timeout_ms != 0 && g_poll_failures.load() > 0) {
        --g_poll_failures;
        errno = ENOMEM;
        return -1;
    }
    return poll(fds, count, timeout_ms);
}

int AliasingPidfdOpen(pid_t pid) {
    if (g_pidfd_failures.load() > 0) {
        --g_pidfd_failures;
        errno = EMFILE;
        return -1;
    }
    std::lock_guard<std::mutex> lock(g_pid_mutex);
    auto alias = g_pid_alias.find(pid);
    return RealPidfdOpen(alias != g_pid_alias.end() ? alias->second : pid);
}

ClientProcessWatcher::Syscalls TestSyscalls() {
    return ClientProcessWatcher::Syscalls{&AliasingPidfdOpen, &FailingPoll};
}

class ClientProcessWatcherTest : public ::testing::Test {
  protected:
    void TearDown() override {
        g_poll_failures = 0;
        g_pidfd_failures = 0;
        std::lock_guard<std::mutex> lock(g_pid_mutex);
        g_pid_alias.clear();
    }

    std::unique_ptr<ChildProcess> Sleeper() {
        std::unique_ptr<ChildProcess> child = StartSleeper(dir_.Path("stderr"));
        EXPECT_TRUE(child->started());
        return child;
    }
    static void Kill(ChildProcess* child) {
        child->Signal(SIGKILL);
        EXPECT_TRUE(child->Wait(kWait).has_value());
    }
    static ProcessId WatchOk(ClientProcessWatcher* watcher, pid_t pid) {
        std::optional<ProcessId> id = watcher->Watch(pid);
        EXPECT_TRUE(id.has_value()) << "pid " << pid;
        return id.value_or(0);
    }

    TempDir dir_;
    Exits exits_;
};

TEST_F(ClientProcessWatcherTest, AKilledProcessIsReportedOnceUnderOneId) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto child = Sleeper();
    const ProcessId id = WatchOk(&watcher, child->pid());
    EXPECT_EQ(WatchOk(&watcher, child->pid()), id) << "a live process keeps its id";
    EXPECT_TRUE(watcher.IsWatching(id));
    EXPECT_EQ(watcher.WatchedCount(), 1u);
    Kill(child.get());
    ASSERT_TRUE(exits_.WaitFor(id));
    EXPECT_EQ(exits_.PidOf(id), child->pid());
    EXPECT_FALSE(watcher.IsWatching(id));
    // A second process's report comes after any second report of the first would have.
    auto other = Sleeper();
    const ProcessId other_id = WatchOk(&watcher, other->pid());
    EXPECT_NE(other_id, id);
    Kill(other.get());
    ASSERT_TRUE(exits_.WaitFor(other_id));
    EXPECT_EQ(exits_.Count(id), 1u);
    EXPECT_EQ(watcher.WatchedCount(), 0u) << "ended processes keep no descriptor";
}

TEST_F(ClientProcessWatcherTest, AProcessAlreadyGoneIsReported) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto child = Sleeper();
    const pid_t pid = child->pid();
    Kill(child.get());  // and reaped: the pid names no process now
    const ProcessId id = WatchOk(&watcher, pid);
    EXPECT_TRUE(exits_.WaitFor(id));
}

TEST_F(ClientProcessWatcherTest, AnUnwatchedProcessIsNotReported) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto first = Sleeper();
    auto second = Sleeper();
    const ProcessId first_id = WatchOk(&watcher, first->pid());
    const ProcessId second_id = WatchOk(&watcher, second->pid());
    watcher.Unwatch(first_id);
    EXPECT_FALSE(watcher.IsWatching(first_id));
    Kill(first.get());
    Kill(second.get());
    ASSERT_TRUE(exits_.WaitFor(second_id));
    EXPECT_EQ(exits_.Count(first_id), 0u);
}

TEST_F(ClientProcessWatcherTest, WatchingAgainAfterUnwatchReportsNoExit) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto live = Sleeper();
    std::vector<int> readable;
    std::vector<ProcessId> live_ids;
    for (int i = 0; i < 300; ++i) {
        live_ids.push_back(WatchOk(&watcher, live->pid()));
        watcher.Unwatch(live_ids.back());
        // Descriptors that are readable, as an exited process's is: one may take the number
        // that the unwatched one had.
        int fds[2];
        ASSERT_EQ(0, pipe(fds));
        ASSERT_EQ(1, write(fds[1], "x", 1));
        readable.insert(readable.end(), {fds[0], fds[1]});
    }
    live_ids.push_back(WatchOk(&watcher, live->pid()));
    auto marker = Sleeper();
    const ProcessId marker_id = WatchOk(&watcher, marker->pid());
    Kill(marker.get());
    ASSERT_TRUE(exits_.WaitFor(marker_id));
    for (ProcessId id : live_ids) {
        EXPECT_EQ(exits_.Count(id), 0u) << "a live process was reported ended";
    }
    for (int fd : readable) close(fd);
}

TEST_F(ClientProcessWatcherTest, AReusedPidIsANewProcess) {
    ClientProcessWatcher watcher(exits_.Recorder(), TestSyscalls());
    auto first = Sleeper();
    auto second = Sleeper();
    // A pid number that names `first` now and `second` once `first` has ended.
    const pid_t reused = first->pid();
    const ProcessId first_id = WatchOk(&watcher, reused);
    Kill(first.get());
    {
        std::lock_guard<std::mutex> lock(g_pid_mutex);
        g_pid_alias[reused] = second->pid();
    }
    // Asked before or after the first one's end is reported, the number is the new process.
    const ProcessId second_id = WatchOk(&watcher, reused);
    EXPECT_NE(second_id, first_id);
    ASSERT_TRUE(exits_.WaitFor(first_id));
    EXPECT_EQ(exits_.PidOf(first_id), reused);
    EXPECT_TRUE(watcher.IsWatching(second_id)) << "the new process was taken for the ended one";
    EXPECT_EQ(WatchOk(&watcher, reused), second_id);
    EXPECT_EQ(exits_.Count(second_id), 0u);
    Kill(second.get());
    EXPECT_TRUE(exits_.WaitFor(second_id));
}

TEST_F(ClientProcessWatcherTest, AFailingPollIsLoggedAndTrackingGoesOn) {
    vyr_test::LogCapture log;
    g_poll_failures = 3;
    ClientProcessWatcher watcher(exits_.Recorder(), TestSyscalls());
    auto child = Sleeper();
    const ProcessId id = WatchOk(&watcher, child->pid());
    EXPECT_TRUE(log.WaitFor(kTag, ANDROID_LOG_ERROR,
                            "client process watcher: poll failed: Cannot allocate memory; trying "
                            "again",
                            kWait));
    Kill(child.get());
    ASSERT_TRUE(exits_.WaitFor(id)) << "the watcher stopped after a failed poll";
    EXPECT_EQ(g_poll_failures.load(), 0);
    EXPECT_EQ(log.Count(kTag, ANDROID_LOG_ERROR,
                        "client process watcher: poll failed: Cannot allocate memory; trying "
                        "again"),
              1u)
        << "one line for a run of failures";
    EXPECT_TRUE(log.Contains(kTag, ANDROID_LOG_INFO,
                             "client process watcher: poll works again after 3 failures"));
}

TEST_F(ClientProcessWatcherTest, AProcessThatCannotBeOpenedIsDroppedWithALogLine) {
    vyr_test::LogCapture log;
    ClientProcessWatcher watcher(exits_.Recorder(), TestSyscalls());
    auto child = Sleeper();
    g_pidfd_failures = 1;
    EXPECT_FALSE(watcher.Watch(child->pid()).has_value());
    EXPECT_TRUE(log.Contains(kTag, ANDROID_LOG_ERROR,
                             "Watch cannot watch client process " + std::to_string(child->pid()) +
                                 ": Too many open files"));
    EXPECT_EQ(watcher.WatchedCount(), 0u);
    // The next one is watched as usual.
    const ProcessId id = WatchOk(&watcher, child->pid());
    Kill(child.get());
    EXPECT_TRUE(exits_.WaitFor(id));
}

TEST_F(ClientProcessWatcherTest, NoThreadUntilTheFirstWatchAndNoneAfterDestruction) {
    const size_t before = vyr_test::SettledThreadCount();
    auto child = Sleeper();
    ProcessId id = 0;
    {
        ClientProcessWatcher watcher(exits_.Recorder());
        EXPECT_EQ(vyr_test::ThreadCount(), before);
        id = WatchOk(&watcher, child->pid());
        EXPECT_EQ(vyr_test::ThreadCount(), before + 1);
    }
    // Joined by the destructor; under qemu-user its task lingers a moment after the join.
    EXPECT_TRUE(vyr_test::WaitForThreadCount(before, kWait)) << vyr_test::ThreadNames();
    Kill(child.get());
    EXPECT_EQ(exits_.Count(id), 0u) << "nothing is reported after destruction";
}

TEST_F(ClientProcessWatcherTest, DestructionDuringPollFailuresLeavesNoThread) {
    g_poll_failures = 1000000;
    const size_t before = vyr_test::SettledThreadCount();
    auto child = Sleeper();
    {
        ClientProcessWatcher watcher(exits_.Recorder(), TestSyscalls());
        WatchOk(&watcher, child->pid());
    }
    EXPECT_TRUE(vyr_test::WaitForThreadCount(before, kWait)) << vyr_test::ThreadNames();
}

}  // namespace
}  // namespace vyr_test::service
