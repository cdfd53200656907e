// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "process_fixture.h"

#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#if !defined(__ANDROID__)
#include <vyr/binder_host.h>
#endif

#include "test_files.h"

extern char** environ;

namespace vyr_test::binder {
namespace {

// The helper: named by the build on the host, installed beside the test on a device.
std::string HelperPath() {
#if defined(BINDER_TEST_HELPER)
    return BINDER_TEST_HELPER;
#else
    return vyr_test::ProgramBesideThisOne("vyr_binder_test_helper");
#endif
}

}  // namespace

DeathLog& DeathLog::Get() {
    static DeathLog* log = new DeathLog;
    return *log;
}

void DeathLog::OnDied(void* cookie) {
    DeathLog& log = Get();
    std::lock_guard<std::mutex> lock(log.mutex_);
    log.notices_.emplace_back(cookie, std::this_thread::get_id());
    log.cv_.notify_all();
}

void DeathLog::Clear() {
    std::lock_guard<std::mutex> lock(mutex_);
    notices_.clear();
}

bool DeathLog::WaitFor(size_t count, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return cv_.wait_for(lock, timeout, [&] { return notices_.size() >= count; });
}

std::vector<std::pair<void*, std::thread::id>> DeathLog::notices() {
    std::lock_guard<std::mutex> lock(mutex_);
    return notices_;
}

size_t DeathLog::CountOf(void* cookie) {
    size_t n = 0;
    for (const auto& notice : notices()) n += notice.first == cookie ? 1 : 0;
    return n;
}

void CrossProcessTest::SetUp() {
    ASSERT_FALSE(registry_.path().empty());
    DeathLog::Get().Clear();
    ABinderProcess_startThreadPool();
}

void CrossProcessTest::TearDown() {
    while (!children_.empty()) Kill(children_.back());
#if !defined(__ANDROID__)
    // Each test starts with a runtime of its own; a device's lives as long as the process.
    VyrBinder_shutdown();
#endif
}

pid_t CrossProcessTest::Spawn(const std::string& mode, const std::string& name) {
    std::string helper = HelperPath();
    std::vector<char*> argv = {helper.data(), const_cast<char*>(mode.c_str()),
                               const_cast<char*>(name.c_str()), nullptr};
    pid_t pid = -1;
    if (posix_spawn(&pid, helper.c_str(), nullptr, nullptr, argv.data(), environ) != 0) {
        return -1;
    }
    children_.push_back(pid);
    return pid;
}

void CrossProcessTest::Kill(pid_t pid) {
    for (auto it = children_.begin(); it != children_.end(); ++it) {
        if (*it == pid) {
            kill(pid, SIGKILL);
            waitpid(pid, nullptr, 0);
            children_.erase(it);
            return;
        }
    }
}

ndk::SpAIBinder CrossProcessTest::WaitForService(const std::string& name) {
    ndk::SpAIBinder binder;
    Eventually([&] {
        binder.set(AServiceManager_checkService(name.c_str()));
        return binder.get() != nullptr;
    });
    return binder;
}

std::shared_ptr<aidl::android::vyr::IVYRService> CrossProcessTest::StartServer(
    const std::string& name, pid_t* pid) {
    pid_t child = Spawn("serve", name);
    if (pid != nullptr) *pid = child;
    return aidl::android::vyr::IVYRService::fromBinder(WaitForService(name));
}

}  // namespace vyr_test::binder
