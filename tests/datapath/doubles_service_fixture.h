// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The service on the sensor doubles in a process of its own (vyr_doubles_service), reached
// through the binder NDK alone, for the suites that run against it on the host and on a device.

#include <aidl/android/vyr/IVYRService.h>
#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "child_process.h"
#include "wait_until.h"

namespace vyr_test::datapath {

constexpr int32_t kRangeMode = 3;
constexpr std::chrono::milliseconds kDeadline{10000};

// Whether `predicate` holds within kDeadline.
inline bool Eventually(const std::function<bool()>& predicate) {
    return WaitUntil(predicate, kDeadline);
}

// Opened once; waited for with a deadline.
class Gate {
  public:
    void Open();
    bool Wait(std::chrono::milliseconds timeout);

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    bool open_ = false;
};

// The path of vyr_doubles_service: the build's, or the one installed beside the test on a device.
std::string DoublesService();

class ServiceAcrossProcessesTest : public ::testing::Test {
  protected:
    void SetUp() override;
    void TearDown() override;

    void StartService();
    void KillService();
    int32_t OpenRange();
    void EnableAt(int32_t handle, int32_t period_ms);
    // PollOnce's result code.
    int32_t Poll(int32_t handle);

    static inline int tests_ = 0;
    std::string dir_;
    std::string name_;
    std::unique_ptr<vyr_test::ChildProcess> server_;
    std::shared_ptr<aidl::android::vyr::IVYRService> service_;
};

}  // namespace vyr_test::datapath
