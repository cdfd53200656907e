// The watcher that tells the service when a client process has ended.

#include "client_process_watcher.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <vector>

#include "child_process.h"
#include "temp_dir.h"
#include "thread_count.h"

namespace vyr_service_test {
namespace {

using android::vyr::binder::ClientProcessWatcher;
using std::chrono::milliseconds;
using vyr_test::ChildProcess;

constexpr milliseconds kWait{5000};

// The pids reported ended, in order.
class Exits {
  public:
    ClientProcessWatcher::OnExit Recorder() {
        return [this](pid_t pid) {
            std::lock_guard<std::mutex> lock(mutex_);
            pids_.push_back(pid);
            changed_.notify_all();
        };
    }
    bool WaitFor(pid_t pid) {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kWait, [&] { return CountLocked(pid) > 0; });
    }
    size_t Count(pid_t pid) {
        std::lock_guard<std::mutex> lock(mutex_);
        return CountLocked(pid);
    }

  private:
    size_t CountLocked(pid_t pid) const {
        size_t count = 0;
        for (pid_t reported : pids_) count += reported == pid;
        return count;
    }
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<pid_t> pids_;
};

class ClientProcessWatcherTest : public ::testing::Test {
  protected:
    std::unique_ptr<ChildProcess> Sleeper() {
        auto child = std::make_unique<ChildProcess>(std::vector<std::string>{"/bin/sleep", "60"},
                                                    std::map<std::string, std::string>{},
                                                    dir_.Path("stderr"));
        EXPECT_TRUE(child->started());
        return child;
    }
    static void Kill(ChildProcess* child) {
        child->Signal(SIGKILL);
        EXPECT_TRUE(child->Wait(kWait).has_value());
    }

    TempDir dir_;
    Exits exits_;
};

TEST_F(ClientProcessWatcherTest, AKilledProcessIsReportedOnce) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto child = Sleeper();
    const pid_t pid = child->pid();
    ASSERT_TRUE(watcher.Watch(pid));
    ASSERT_TRUE(watcher.Watch(pid)) << "watching twice is watching once";
    EXPECT_TRUE(watcher.IsWatching(pid));
    Kill(child.get());
    ASSERT_TRUE(exits_.WaitFor(pid));
    EXPECT_FALSE(watcher.IsWatching(pid));
    // A second process's report comes after any second report of the first would have.
    auto other = Sleeper();
    ASSERT_TRUE(watcher.Watch(other->pid()));
    Kill(other.get());
    ASSERT_TRUE(exits_.WaitFor(other->pid()));
    EXPECT_EQ(exits_.Count(pid), 1u);
}

TEST_F(ClientProcessWatcherTest, AProcessAlreadyGoneIsReported) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto child = Sleeper();
    const pid_t pid = child->pid();
    Kill(child.get());  // and reaped: the pid names no process now
    ASSERT_TRUE(watcher.Watch(pid));
    EXPECT_TRUE(exits_.WaitFor(pid));
}

TEST_F(ClientProcessWatcherTest, AnUnwatchedProcessIsNotReported) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto first = Sleeper();
    auto second = Sleeper();
    ASSERT_TRUE(watcher.Watch(first->pid()));
    ASSERT_TRUE(watcher.Watch(second->pid()));
    watcher.Unwatch(first->pid());
    EXPECT_FALSE(watcher.IsWatching(first->pid()));
    Kill(first.get());
    Kill(second.get());
    ASSERT_TRUE(exits_.WaitFor(second->pid()));
    EXPECT_EQ(exits_.Count(first->pid()), 0u);
}

TEST_F(ClientProcessWatcherTest, WatchingAgainAfterUnwatchReportsNoExit) {
    ClientProcessWatcher watcher(exits_.Recorder());
    auto live = Sleeper();
    std::vector<int> readable;
    for (int i = 0; i < 300; ++i) {
        ASSERT_TRUE(watcher.Watch(live->pid()));
        watcher.Unwatch(live->pid());
        // Descriptors that are readable, as an exited process's is: one may take the number
        // that the unwatched one had.
        int fds[2];
        ASSERT_EQ(0, pipe(fds));
        ASSERT_EQ(1, write(fds[1], "x", 1));
        readable.insert(readable.end(), {fds[0], fds[1]});
    }
    ASSERT_TRUE(watcher.Watch(live->pid()));
    auto marker = Sleeper();
    ASSERT_TRUE(watcher.Watch(marker->pid()));
    Kill(marker.get());
    ASSERT_TRUE(exits_.WaitFor(marker->pid()));
    EXPECT_EQ(exits_.Count(live->pid()), 0u) << "a live process was reported ended";
    for (int fd : readable) close(fd);
}

TEST_F(ClientProcessWatcherTest, NoThreadUntilTheFirstWatchAndNoneAfterDestruction) {
    const size_t before = vyr_test::ThreadCount();
    auto child = Sleeper();
    {
        ClientProcessWatcher watcher(exits_.Recorder());
        EXPECT_EQ(vyr_test::ThreadCount(), before);
        ASSERT_TRUE(watcher.Watch(child->pid()));
        EXPECT_EQ(vyr_test::ThreadCount(), before + 1);
    }
    EXPECT_EQ(vyr_test::ThreadCount(), before);
    Kill(child.get());
    EXPECT_EQ(exits_.Count(child->pid()), 0u) << "nothing is reported after destruction";
}

}  // namespace
}  // namespace vyr_service_test
