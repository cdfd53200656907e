// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// A test that runs the helper (binder_test_helper) in other processes and talks to it through
// the binder NDK alone, so that the same tests build against a device's libbinder_ndk.

#include <aidl/android/vyr/IVYRService.h>
#include <gtest/gtest.h>
#include <sys/types.h>

#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "binder_test_env.h"
#include "wait_until.h"

namespace vyr_test::binder {

using namespace std::chrono_literals;

// Death notices as the runtime delivered them: cookie and thread.
class DeathLog {
  public:
    static DeathLog& Get();
    static void OnDied(void* cookie);
    void Clear();
    bool WaitFor(size_t count, std::chrono::milliseconds timeout = 10s);
    std::vector<std::pair<void*, std::thread::id>> notices();
    size_t CountOf(void* cookie);

  private:
    std::mutex mutex_;
    std::condition_variable cv_;
    std::vector<std::pair<void*, std::thread::id>> notices_;
};

inline bool Eventually(const std::function<bool()>& predicate,
                       std::chrono::milliseconds timeout = 10s) {
    return vyr_test::WaitUntil(predicate, timeout);
}

class CrossProcessTest : public ::testing::Test {
  protected:
    void SetUp() override;
    void TearDown() override;

    // Starts the helper in `mode` for `name`; its pid, or -1.
    pid_t Spawn(const std::string& mode, const std::string& name);
    void Kill(pid_t pid);
    ndk::SpAIBinder WaitForService(const std::string& name);
    // Starts a helper serving a TestService as `name`.
    std::shared_ptr<aidl::android::vyr::IVYRService> StartServer(const std::string& name,
                                                                 pid_t* pid = nullptr);

    ScopedRegistryDir registry_;
    std::vector<pid_t> children_;
};

}  // namespace vyr_test::binder
