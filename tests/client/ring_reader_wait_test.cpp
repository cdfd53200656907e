// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// SampleRingReader::WaitNewer: a record already there is returned at once, one written while
// the reader sleeps wakes it (also in another process, whose futex is not this process's), the
// deadline ends a wait with nothing, a signal interrupts it, and a reader that fell a lap behind
// resumes at the oldest record left.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "ring_fixture.h"
#include "test_files.h"

namespace vyr_test::client {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;
using vyr::RingSample;
using WaitResult = vyr::SampleRingReader::WaitResult;

constexpr milliseconds kLong{10000};
// How late a woken reader may return: far below kLong, so that a reader that is never woken and
// only returns at its deadline fails.
constexpr milliseconds kWakeSlack{3000};

// The scheduler state of a thread or process (its /proc stat file): 'S' while it sleeps in a
// system call.
char StateOf(const std::string& stat_path) {
    const std::string stat = ReadFile(stat_path);
    const size_t end_of_name = stat.rfind(')');
    return end_of_name == std::string::npos || end_of_name + 2 >= stat.size()
               ? '?'
               : stat[end_of_name + 2];
}

// Waits until the thread or process is asleep; its only sleep is the wait under test.
bool WaitUntilAsleep(const std::string& stat_path) {
    const auto deadline = steady_clock::now() + kLong;
    while (steady_clock::now() < deadline) {
        if (StateOf(stat_path) == 'S') return true;
        std::this_thread::yield();
    }
    return false;
}

std::string ThreadStatPath(pid_t tid) {
    return "/proc/self/task/" + std::to_string(tid) + "/stat";
}

// A thread that waits for a record newer than `seq` once, and reports its result.
class Waiter {
  public:
    Waiter(const vyr::SampleRingReader& reader, uint64_t seq, milliseconds timeout)
        : thread_([this, &reader, seq, timeout] {
              tid_ = static_cast<pid_t>(syscall(SYS_gettid));
              const auto start = steady_clock::now();
              result_ = reader.WaitNewer(seq, start + timeout, &sample_);
              took_ = std::chrono::duration_cast<milliseconds>(steady_clock::now() - start);
          }) {}
    ~Waiter() {
        if (thread_.joinable()) thread_.join();
    }

    // Waits until the thread sleeps in WaitNewer.
    bool Asleep() {
        const auto deadline = steady_clock::now() + kLong;
        while (tid_ == 0 && steady_clock::now() < deadline) std::this_thread::yield();
        return tid_ != 0 && WaitUntilAsleep(ThreadStatPath(tid_));
    }
    pthread_t handle() { return thread_.native_handle(); }
    WaitResult Join() {
        thread_.join();
        return result_;
    }
    const RingSample& sample() const { return sample_; }
    milliseconds took() const { return took_; }

  private:
    std::atomic<pid_t> tid_{0};
    WaitResult result_ = WaitResult::kFailed;
    RingSample sample_;
    milliseconds took_{0};
    std::thread thread_;
};

TEST(RingWaitTest, ARecordAlreadyNewerIsReturnedAtOnce) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    fixture.Write(100);
    fixture.Write(200);
    RingSample sample;
    // A deadline already past: nothing to wait for.
    ASSERT_EQ(fixture.reader().WaitNewer(1, steady_clock::now() - kLong, &sample), WaitResult::kOk);
    EXPECT_EQ(sample.seq, 2u);
    EXPECT_TRUE(IsWholeSample(sample));
    EXPECT_EQ(fixture.reader().WaitNewer(0, steady_clock::now(), &sample), WaitResult::kOk);
    EXPECT_EQ(sample.seq, 1u);
}

TEST(RingWaitTest, AReaderThatFellALapBehindResumesAtTheOldestRecordLeft) {
    RingFixture fixture(4);
    ASSERT_TRUE(fixture.ready());
    for (int64_t boottime = 100; boottime <= 1000; boottime += 100) fixture.Write(boottime);
    RingSample sample;
    ASSERT_EQ(fixture.reader().WaitNewer(2, steady_clock::now(), &sample), WaitResult::kOk);
    EXPECT_EQ(sample.seq, 7u);
    ASSERT_EQ(fixture.reader().WaitNewer(8, steady_clock::now(), &sample), WaitResult::kOk);
    EXPECT_EQ(sample.seq, 9u);
}

TEST(RingWaitTest, AWriteWakesASleepingReader) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    fixture.Write(100);
    Waiter waiter(fixture.reader(), 1, kLong);
    ASSERT_TRUE(waiter.Asleep());
    fixture.Write(200);
    ASSERT_EQ(waiter.Join(), WaitResult::kOk);
    EXPECT_EQ(waiter.sample().seq, 2u);
    EXPECT_EQ(waiter.sample().boottime_ns, 200);
    EXPECT_LT(waiter.took(), kWakeSlack);
}

// The writer wakes one waiter only, so that its cost does not grow with the readers; the woken
// reader wakes the others.
TEST(RingWaitTest, OneWriteWakesEverySleepingReader) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    fixture.Write(100);
    std::vector<std::unique_ptr<Waiter>> waiters;
    for (int i = 0; i < 5; ++i) {
        waiters.push_back(std::make_unique<Waiter>(fixture.reader(), 1, kLong));
    }
    for (auto& waiter : waiters) ASSERT_TRUE(waiter->Asleep());
    fixture.Write(200);
    for (auto& waiter : waiters) {
        ASSERT_EQ(waiter->Join(), WaitResult::kOk);
        EXPECT_EQ(waiter->sample().seq, 2u);
        EXPECT_LT(waiter->took(), kWakeSlack) << "woken only by its deadline";
    }
}

TEST(RingWaitTest, TheDeadlineEndsAWaitForNothing) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    fixture.Write(100);
    constexpr milliseconds kTimeout{300};
    const auto start = steady_clock::now();
    RingSample sample;
    EXPECT_EQ(fixture.reader().WaitNewer(1, start + kTimeout, &sample), WaitResult::kTimedOut);
    const auto took = steady_clock::now() - start;
    EXPECT_GE(took, kTimeout);
    EXPECT_LT(took, kTimeout + kWakeSlack);
}

void IgnoreSignal(int) {}

TEST(RingWaitTest, ASignalInterruptsTheWait) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    // As vyrctl installs its stop handlers: without SA_RESTART.
    struct sigaction action = {};
    struct sigaction old = {};
    action.sa_handler = IgnoreSignal;
    sigemptyset(&action.sa_mask);
    ASSERT_EQ(sigaction(SIGUSR1, &action, &old), 0);
    {
        Waiter waiter(fixture.reader(), 0, kLong);
        ASSERT_TRUE(waiter.Asleep());
        ASSERT_EQ(pthread_kill(waiter.handle(), SIGUSR1), 0);
        EXPECT_EQ(waiter.Join(), WaitResult::kInterrupted);
        EXPECT_LT(waiter.took(), kWakeSlack);
    }
    sigaction(SIGUSR1, &old, nullptr);
}

// The reader in a child process of its own, mapping its own copy of the client's descriptor:
// the writer's wake-up reaches it only through the shared memory's futex key.
TEST(RingWaitTest, AWriteWakesAReaderInAnotherProcess) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    int report[2];
    ASSERT_EQ(pipe2(report, O_CLOEXEC), 0);
    ndk::ScopedFileDescriptor client_fd = fixture.ClientFd();
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        std::string error;
        std::unique_ptr<vyr::SampleRingReader> reader =
            vyr::SampleRingReader::Map(std::move(client_fd), &error);
        uint64_t seq = 0;
        if (reader != nullptr) {
            RingSample sample;
            const auto start = steady_clock::now();
            if (reader->WaitNewer(0, start + kLong, &sample) == WaitResult::kOk &&
                steady_clock::now() - start < kWakeSlack && IsWholeSample(sample)) {
                seq = sample.seq;
            }
        }
        (void)!write(report[1], &seq, sizeof(seq));
        _exit(0);
    }
    close(report[1]);
    EXPECT_TRUE(WaitUntilAsleep("/proc/" + std::to_string(child) + "/stat"));
    fixture.Write(100);
    pollfd readable = {report[0], POLLIN, 0};
    uint64_t seq = 0;
    EXPECT_EQ(poll(&readable, 1, static_cast<int>(kLong.count())), 1);
    EXPECT_EQ(read(report[0], &seq, sizeof(seq)), static_cast<ssize_t>(sizeof(seq)));
    EXPECT_EQ(seq, 1u) << "the child's reader was not woken by the write, or read it wrong";
    close(report[0]);
    int status = 0;
    waitpid(child, &status, 0);
}

}  // namespace
}  // namespace vyr_test::client
