// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "thread_count.h"

#include <dirent.h>
#include <pthread.h>

#include <cstdio>
#include <fstream>
#include <sstream>
#include <thread>

namespace vyr_test {
namespace {

// The kernel's PF_EXITING task flag.
constexpr unsigned long kExiting = 0x4;

// The fields of a task's stat line after its name; empty when the task is gone.
std::string StatFields(const std::string& tid) {
    std::ifstream stat("/proc/self/task/" + tid + "/stat");
    std::string line;
    if (!std::getline(stat, line)) return "";
    return line.substr(line.rfind(')') + 1);
}

// A joined thread wakes its joiner before the kernel has removed its task; such a task is past
// the point of return and is not counted.
bool Exiting(const std::string& tid) {
    std::istringstream fields(StatFields(tid));
    std::string skipped;
    for (int i = 0; i < 6; ++i) fields >> skipped;  // state, ppid, pgrp, session, tty, tpgid
    unsigned long flags = 0;
    fields >> flags;
    return !fields || (flags & kExiting) != 0;
}

std::string ThreadName(const std::string& tid) {
    std::ifstream comm("/proc/self/task/" + tid + "/comm");
    std::string name;
    std::getline(comm, name);
    return name;
}

template <typename Visit>
void ForEachLiveThread(Visit visit) {
    DIR* dir = opendir("/proc/self/task");
    if (dir == nullptr) return;
    while (dirent* entry = readdir(dir)) {
        if (entry->d_name[0] != '.' && !Exiting(entry->d_name)) visit(std::string(entry->d_name));
    }
    closedir(dir);
}

}  // namespace

size_t ThreadCount() {
    size_t count = 0;
    ForEachLiveThread([&count](const std::string&) { ++count; });
    return count;
}

size_t SettledThreadCount() {
    constexpr char kProbe[] = "vyr-probe";
    std::thread([&kProbe] { pthread_setname_np(pthread_self(), kProbe); }).join();
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    bool lingering = true;
    while (lingering && std::chrono::steady_clock::now() < deadline) {
        lingering = false;
        ForEachLiveThread([&lingering, &kProbe](const std::string& tid) {
            if (ThreadName(tid) == kProbe) lingering = true;
        });
        if (lingering) std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return ThreadCount();
}

std::string ThreadNames() {
    std::string names;
    ForEachLiveThread([&names](const std::string& tid) {
        names += (names.empty() ? "" : ", ") + ThreadName(tid);
    });
    return names;
}

namespace {

template <typename Done>
bool WaitForThreads(Done done, std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (!done(ThreadCount())) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return true;
}

}  // namespace

bool WaitForThreadCount(size_t count, std::chrono::milliseconds timeout) {
    return WaitForThreads([count](size_t now) { return now == count; }, timeout);
}

bool WaitForThreadCountBelow(size_t count, std::chrono::milliseconds timeout) {
    return WaitForThreads([count](size_t now) { return now < count; }, timeout);
}

std::map<pid_t, unsigned long> VoluntarySwitches(const std::string& prefix) {
    std::map<pid_t, unsigned long> switches;
    ForEachLiveThread([&switches, &prefix](const std::string& tid) {
        if (ThreadName(tid).compare(0, prefix.size(), prefix) != 0) return;
        std::ifstream status("/proc/self/task/" + tid + "/status");
        std::string line;
        while (std::getline(status, line)) {
            unsigned long count = 0;
            if (sscanf(line.c_str(), "voluntary_ctxt_switches: %lu", &count) == 1) {
                switches[std::stoi(tid)] = count;
            }
        }
    });
    return switches;
}

bool WaitUntilAsleep(pid_t tid, std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (true) {
        std::istringstream fields(StatFields(std::to_string(tid)));
        std::string state;
        fields >> state;
        if (state == "S") return true;
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::yield();
    }
}

}  // namespace vyr_test
