// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "doubles_service_fixture.h"

#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <vector>

#include "test_files.h"

namespace vyr_test::datapath {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;

void Gate::Open() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        open_ = true;
    }
    changed_.notify_all();
}

bool Gate::Wait(std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, timeout, [this] { return open_; });
}

std::string DoublesService() {
#if defined(VYR_DOUBLES_SERVICE)
    return VYR_DOUBLES_SERVICE;
#else
    return vyr_test::ProgramBesideThisOne("vyr_doubles_service");
#endif
}

void ServiceAcrossProcessesTest::SetUp() {
    dir_ = vyr_test::MakeTempDir("vyr-doubles-");
    ASSERT_FALSE(dir_.empty());
    // The host runtime's registry; a device's servicemanager has no use for it.
    setenv("VYR_BINDER_DIR", dir_.c_str(), 1);
    ABinderProcess_startThreadPool();
    name_ = "vyr.doubles." + std::to_string(getpid()) + "." + std::to_string(++tests_);
    StartService();
}

void ServiceAcrossProcessesTest::TearDown() {
    service_.reset();
    server_.reset();
    std::error_code ignored;
    std::filesystem::remove_all(dir_, ignored);
}

void ServiceAcrossProcessesTest::StartService() {
    server_ = std::make_unique<vyr_test::ChildProcess>(
        std::vector<std::string>{DoublesService(), "serve", name_},
        std::map<std::string, std::string>{}, dir_ + "/service.log");
    ASSERT_TRUE(server_->ReadLineStartingWith("registered", kDeadline)) << "no service";
    service_ = IVYRService::fromBinder(ndk::SpAIBinder(AServiceManager_checkService(name_.c_str())));
    ASSERT_NE(service_, nullptr);
}

void ServiceAcrossProcessesTest::KillService() {
    server_->Signal(SIGKILL);
    ASSERT_TRUE(server_->Wait(kDeadline));
}

int32_t ServiceAcrossProcessesTest::OpenRange() {
    int32_t handle = 0;
    EXPECT_TRUE(service_->Open(kRangeMode, &handle).isOk());
    EXPECT_GT(handle, 0);
    return handle;
}

void ServiceAcrossProcessesTest::EnableAt(int32_t handle, int32_t period_ms) {
    int32_t result = -1;
    ASSERT_TRUE(service_->Enable(handle, period_ms, &result).isOk());
    ASSERT_EQ(result, 0);
}

int32_t ServiceAcrossProcessesTest::Poll(int32_t handle) {
    Event event;
    int32_t result = 1;
    EXPECT_TRUE(service_->PollOnce(handle, &event, &result).isOk());
    return result;
}

}  // namespace vyr_test::datapath
