// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The floor of a ring sample's age when a waiting reader in another process sees it: the bare
// cross-process futex wake that the sample ring uses, with nothing else in it. A writer stamps a
// word of shared memory (a memfd, as the ring's) with CLOCK_BOOTTIME every period, bumps the
// futex word and wakes one waiter, which wakes the others; N reader processes sleep on the word
// and note the age of each stamp they see.
//
//   bench_ring_floor [--readers N] [--period-ms P] [--seconds S]
//
// Prints "p50 X ms, p99 Y ms (N events)".
#include <android-base/file.h>
#include <android-base/unique_fd.h>
#include <linux/futex.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <vector>

#include "ages.h"
#include "flags.h"
#include "peers.h"

namespace {

using vyr_bench::BootTimeNs;

// Stamps before this are of the start-up, not of the steady state.
constexpr auto kSettle = std::chrono::milliseconds(1500);

struct Options {
    int readers = 1;
    int period_ms = 33;
    double seconds = 10;
};

struct Shared {
    uint32_t futex;
    uint32_t stop;
    int64_t stamp;
    uint32_t counting;
};

long Futex(uint32_t* word, int op, uint32_t value, const timespec* timeout) {
    return syscall(SYS_futex, word, op, value, timeout, nullptr, 0);
}

// A reader: sleeps on the word, notes each new stamp's age, and at the end writes them to `out`.
[[noreturn]] void Read(Shared* shared, int out) {
    std::vector<int64_t> ages;
    uint32_t seen = __atomic_load_n(&shared->futex, __ATOMIC_ACQUIRE);
    const timespec second{1, 0};
    while (__atomic_load_n(&shared->stop, __ATOMIC_ACQUIRE) == 0) {
        const long woken = Futex(&shared->futex, FUTEX_WAIT, seen, &second);
        const uint32_t now = __atomic_load_n(&shared->futex, __ATOMIC_ACQUIRE);
        if (now == seen) continue;
        // The ring's protocol: the writer wakes one reader, which wakes the others.
        if (woken == 0) Futex(&shared->futex, FUTEX_WAKE, INT_MAX, nullptr);
        const int64_t read_at = BootTimeNs();
        seen = now;
        const int64_t stamp = __atomic_load_n(&shared->stamp, __ATOMIC_RELAXED);
        if (__atomic_load_n(&shared->counting, __ATOMIC_RELAXED) != 0) {
            ages.push_back(read_at - stamp);
        }
    }
    const bool written = android::base::WriteFully(out, ages.data(), ages.size() * sizeof(int64_t));
    _exit(written ? 0 : 1);
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!vyr_bench::ParseFlags(argc, argv,
                               {{"--readers", &options.readers},
                                {"--period-ms", &options.period_ms},
                                {"--seconds", &options.seconds}}))
        return 2;
    if (options.readers < 1 || options.period_ms < 1 || options.seconds <= 0) {
        fprintf(stderr, "usage: bench_ring_floor [--readers N] [--period-ms P] [--seconds S]\n");
        return 2;
    }
    android::base::unique_fd memory(memfd_create("vyr-ring-floor", MFD_CLOEXEC));
    if (memory.get() < 0 || ftruncate(memory.get(), sizeof(Shared)) != 0) return 1;
    void* mapped =
        mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED, memory.get(), 0);
    if (mapped == MAP_FAILED) return 1;
    Shared* shared = static_cast<Shared*>(mapped);

    std::vector<pid_t> children;
    std::vector<android::base::unique_fd> results;
    for (int i = 0; i < options.readers; ++i) {
        int pipe_fds[2];
        if (pipe(pipe_fds) != 0) return 1;
        const pid_t pid = fork();
        if (pid == 0) {
            close(pipe_fds[0]);
            Read(shared, pipe_fds[1]);
        }
        close(pipe_fds[1]);
        if (pid < 0) return 1;
        children.push_back(pid);
        results.emplace_back(pipe_fds[0]);
    }

    const auto period = std::chrono::milliseconds(options.period_ms);
    const auto start = std::chrono::steady_clock::now();
    const auto end = start + kSettle +
                     std::chrono::duration_cast<std::chrono::nanoseconds>(
                         std::chrono::duration<double>(options.seconds));
    auto next = start + period;
    while (next < end) {
        vyr_bench::WaitUntil(next);
        __atomic_store_n(&shared->counting, next >= start + kSettle ? 1u : 0u, __ATOMIC_RELAXED);
        next += period;
        __atomic_store_n(&shared->stamp, BootTimeNs(), __ATOMIC_RELAXED);
        __atomic_add_fetch(&shared->futex, 1u, __ATOMIC_RELEASE);
        Futex(&shared->futex, FUTEX_WAKE, 1, nullptr);
    }
    __atomic_store_n(&shared->stop, 1u, __ATOMIC_RELEASE);
    __atomic_add_fetch(&shared->futex, 1u, __ATOMIC_RELEASE);
    Futex(&shared->futex, FUTEX_WAKE, INT_MAX, nullptr);

    std::vector<int64_t> all;
    for (const android::base::unique_fd& result : results) {
        std::string bytes;
        if (!android::base::ReadFdToString(result.get(), &bytes)) continue;
        const size_t count = bytes.size() / sizeof(int64_t);
        const size_t at = all.size();
        all.resize(at + count);
        memcpy(all.data() + at, bytes.data(), count * sizeof(int64_t));
    }
    for (pid_t child : children) waitpid(child, nullptr, 0);
    munmap(mapped, sizeof(Shared));
    printf("%s\n", vyr_bench::AgeSummary(&all).c_str());
    return all.empty() ? 1 : 0;
}
