// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "stop_signal.h"

#include <signal.h>

#include <algorithm>
#include <atomic>
#include <thread>

namespace vyrctl {
namespace {

std::atomic<bool> g_stop{false};

void OnSignal(int) {
    g_stop.store(true);
}

constexpr std::chrono::milliseconds kSlice{20};

}  // namespace

void StopSignal::Install() {
    struct sigaction action = {};
    action.sa_handler = OnSignal;
    sigemptyset(&action.sa_mask);
    action.sa_flags = 0;
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
}

bool StopSignal::Requested() {
    return g_stop.load();
}

bool StopSignal::SleepFor(std::chrono::milliseconds duration) {
    auto deadline = std::chrono::steady_clock::now() + duration;
    while (!Requested()) {
        auto now = std::chrono::steady_clock::now();
        if (now >= deadline) return false;
        std::this_thread::sleep_for(
            std::min<std::chrono::steady_clock::duration>(kSlice, deadline - now));
    }
    return true;
}

}  // namespace vyrctl
