// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The floor of the service's CPU per delivered event: the same pattern of wake-ups with nothing
// else in it. One thread publishes a sample at the sensor's frame rate; each of N client threads
// wakes once per client period on a timed condition-variable wait and, when a sample is new to
// it, sends an event's bytes to an echo process of its own and waits for the reply's bytes.
//
//   bench_event_floor [--clients N] [--period-ms P] [--frame-hz F] [--seconds S]
//
// Prints the process's CPU time per event delivered.
#include <android-base/file.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <mutex>
#include <thread>
#include <vector>

#include "flags.h"
#include "peers.h"

namespace {

using vyr_bench::kEventBytes;
using vyr_bench::kReplyBytes;

struct Options {
    int clients = 10;
    int period_ms = 10;
    int frame_hz = 30;
    double seconds = 10;
};

std::atomic<bool> g_stop{false};
std::atomic<long> g_events{0};

std::mutex g_sample_mutex;
long g_sample = 0;

void Echo(int fd) {
    char event[kEventBytes];
    char reply[kReplyBytes] = {1};
    while (android::base::ReadFully(fd, event, sizeof(event))) {
        if (write(fd, reply, sizeof(reply)) != static_cast<ssize_t>(sizeof(reply))) break;
    }
    _exit(0);
}

void Sensor(const Options& options) {
    const auto period = std::chrono::nanoseconds(1000000000LL / options.frame_hz);
    auto next = std::chrono::steady_clock::now() + period;
    while (!g_stop.load(std::memory_order_relaxed)) {
        vyr_bench::WaitUntil(next);
        next += period;
        std::lock_guard<std::mutex> lock(g_sample_mutex);
        ++g_sample;
    }
}

void Client(const Options& options, int fd, int index) {
    // Clients that start at different times wake at different times.
    std::this_thread::sleep_for(
        std::chrono::microseconds(1000LL * options.period_ms * index / options.clients));
    char event[kEventBytes] = {2};
    char reply[kReplyBytes];
    long taken = 0;
    while (!g_stop.load(std::memory_order_relaxed)) {
        long sample;
        {
            std::lock_guard<std::mutex> lock(g_sample_mutex);
            sample = g_sample;
        }
        if (sample != taken) {
            taken = sample;
            if (!vyr_bench::RoundTrip(fd, event, reply)) return;
            g_events.fetch_add(1, std::memory_order_relaxed);
        }
        vyr_bench::WaitUntil(std::chrono::steady_clock::now() +
                             std::chrono::milliseconds(options.period_ms));
    }
}

double CpuSeconds() {
    timespec now{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!vyr_bench::ParseFlags(argc, argv,
                               {{"--clients", &options.clients},
                                {"--period-ms", &options.period_ms},
                                {"--frame-hz", &options.frame_hz},
                                {"--seconds", &options.seconds}}))
        return 2;
    if (options.clients < 1 || options.period_ms < 1 || options.frame_hz < 1 ||
        options.seconds <= 0) {
        fprintf(stderr,
                "usage: bench_event_floor [--clients N] [--period-ms P] [--frame-hz F] "
                "[--seconds S]\n");
        return 2;
    }
    const std::vector<int> fds = vyr_bench::ForkPeers(options.clients, Echo);
    if (fds.empty()) return 1;
    std::vector<std::thread> threads;
    threads.emplace_back(Sensor, std::cref(options));
    for (int i = 0; i < options.clients; ++i) {
        threads.emplace_back(Client, std::cref(options), fds[i], i);
    }

    // As bench/run does for the service: let the clients settle first.
    std::this_thread::sleep_for(std::chrono::milliseconds(1500));
    const double cpu0 = CpuSeconds();
    const long events0 = g_events.load();
    std::this_thread::sleep_for(std::chrono::duration<double>(options.seconds));
    const double cpu = CpuSeconds() - cpu0;
    const long events = g_events.load() - events0;
    g_stop = true;
    for (std::thread& thread : threads) thread.join();
    vyr_bench::EndPeers(fds);
    if (events == 0) {
        printf("no events\n");
        return 1;
    }
    printf("%.0f us (%ld events)\n", cpu * 1e6 / static_cast<double>(events), events);
    return 0;
}
