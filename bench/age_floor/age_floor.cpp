// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The floor of a sample's age when a callback client receives it: the same wake-up and calls as
// the service's delivery on sample, with nothing else in it. A sensor thread stamps each sample
// with CLOCK_BOOTTIME and wakes N sender threads through one condition variable; each sender
// sends an event's bytes to a client process of its own and waits for the reply (a two-way
// call). The client process notes the boot time at which it has read the event and returns the
// sample's age in the reply.
//
//   bench_age_floor [--clients N] [--period-ms P] [--seconds S]
//
// Prints "p50 X ms, p99 Y ms (N events)".
#include <android-base/file.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <mutex>
#include <thread>
#include <vector>

#include "ages.h"
#include "flags.h"
#include "peers.h"

namespace {

using vyr_bench::BootTimeNs;
using vyr_bench::kEventBytes;
using vyr_bench::kReplyBytes;

// Ages before this are of the start-up, not of the steady state.
constexpr auto kSettle = std::chrono::milliseconds(1500);

struct Options {
    int clients = 1;
    int period_ms = 33;
    double seconds = 10;
};

std::atomic<bool> g_stop{false};
std::atomic<bool> g_counting{false};
std::mutex g_sample_mutex;
std::condition_variable g_sample_cv;
uint64_t g_sample = 0;
int64_t g_sample_boottime = 0;

void Echo(int fd) {
    char event[kEventBytes];
    char reply[kReplyBytes] = {};
    while (android::base::ReadFully(fd, event, sizeof(event))) {
        int64_t read_at = BootTimeNs();
        int64_t stamp = 0;
        memcpy(&stamp, event, sizeof(stamp));
        const int64_t age = read_at - stamp;
        memcpy(reply, &age, sizeof(age));
        if (write(fd, reply, sizeof(reply)) != static_cast<ssize_t>(sizeof(reply))) break;
    }
    _exit(0);
}

void Sensor(const Options& options) {
    const auto period = std::chrono::milliseconds(options.period_ms);
    auto next = std::chrono::steady_clock::now() + period;
    while (!g_stop.load()) {
        vyr_bench::WaitUntil(next);
        next += period;
        {
            std::lock_guard<std::mutex> lock(g_sample_mutex);
            ++g_sample;
            g_sample_boottime = BootTimeNs();
        }
        g_sample_cv.notify_all();
    }
    g_sample_cv.notify_all();
}

void Sender(int fd, std::vector<int64_t>* ages) {
    char event[kEventBytes] = {2};
    char reply[kReplyBytes];
    uint64_t taken = 0;
    while (true) {
        int64_t stamp = 0;
        {
            std::unique_lock<std::mutex> lock(g_sample_mutex);
            g_sample_cv.wait(lock, [&] { return g_stop.load() || g_sample != taken; });
            if (g_stop.load()) return;
            taken = g_sample;
            stamp = g_sample_boottime;
        }
        memcpy(event, &stamp, sizeof(stamp));
        if (!vyr_bench::RoundTrip(fd, event, reply)) return;
        int64_t age = 0;
        memcpy(&age, reply, sizeof(age));
        if (g_counting.load()) ages->push_back(age);
    }
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!vyr_bench::ParseFlags(argc, argv,
                               {{"--clients", &options.clients},
                                {"--period-ms", &options.period_ms},
                                {"--seconds", &options.seconds}}))
        return 2;
    if (options.clients < 1 || options.period_ms < 1 || options.seconds <= 0) {
        fprintf(stderr, "usage: bench_age_floor [--clients N] [--period-ms P] [--seconds S]\n");
        return 2;
    }
    const std::vector<int> fds = vyr_bench::ForkPeers(options.clients, Echo);
    if (fds.empty()) return 1;
    std::vector<std::vector<int64_t>> ages(options.clients);
    std::vector<std::thread> threads;
    threads.emplace_back(Sensor, std::cref(options));
    for (int i = 0; i < options.clients; ++i) threads.emplace_back(Sender, fds[i], &ages[i]);

    std::this_thread::sleep_for(kSettle);
    g_counting = true;
    std::this_thread::sleep_for(std::chrono::duration<double>(options.seconds));
    g_counting = false;
    {
        std::lock_guard<std::mutex> lock(g_sample_mutex);
        g_stop = true;
    }
    g_sample_cv.notify_all();
    for (std::thread& thread : threads) thread.join();
    vyr_bench::EndPeers(fds);
    std::vector<int64_t> all;
    for (const auto& client : ages) all.insert(all.end(), client.begin(), client.end());
    printf("%s\n", vyr_bench::AgeSummary(&all).c_str());
    return all.empty() ? 1 : 0;
}
