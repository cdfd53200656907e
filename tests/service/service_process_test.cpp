// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The real vyrservice binary in a process of its own, reached over the host binder runtime.

#include <aidl/android/vyr/BnEventCallback.h>
#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <optional>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "child_process.h"
#include "ignoring_callback.h"
#include "test_files.h"

namespace vyr_test::service {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;
using aidl::android::vyr::IVYRService;
using namespace std::chrono_literals;

constexpr char kServiceName[] = "vyrservice";
constexpr char kCallbackClientFlag[] = "--callback-client";

std::string g_self;
std::string g_work_dir;

std::map<std::string, std::string> ServiceEnv(const std::string& dir,
                                              const std::string& binder_dir) {
    const std::string properties = dir + "/build.prop";
    std::ofstream(properties) << "persist.vendor.camera.vyr_supported=true\n"
                              << "persist.vendor.camera.vyr_range_supported=1\n";
    return {{"VYR_BINDER_DIR", binder_dir}, {"VYR_PROPERTY_FILE", properties}};
}

ndk::SpAIBinder WaitForRegistration(std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (std::chrono::steady_clock::now() < deadline) {
        ndk::SpAIBinder binder(AServiceManager_checkService(kServiceName));
        if (binder.get() != nullptr && AIBinder_isAlive(binder.get())) return binder;
        std::this_thread::sleep_for(10ms);
    }
    return ndk::SpAIBinder();
}

class ServiceProcessTest : public ::testing::Test {
  protected:
    void SetUp() override {
        dir_ = MakeTempDir("vyr-service-process-");
        // A service of an earlier test in this process must be gone from the registry.
        const auto deadline = std::chrono::steady_clock::now() + 5s;
        while (std::chrono::steady_clock::now() < deadline) {
            ndk::SpAIBinder stale(AServiceManager_checkService(kServiceName));
            if (stale.get() == nullptr || !AIBinder_isAlive(stale.get())) break;
            std::this_thread::sleep_for(10ms);
        }
    }
    void TearDown() override {
        service_.reset();
        if (HasFailure()) {
            std::cerr << "service output:\n" << ReadFile(dir_ + "/service.log");
        }
        std::filesystem::remove_all(dir_);
    }

    std::unique_ptr<ChildProcess> StartService() {
        started_ = std::chrono::steady_clock::now();
        return std::make_unique<ChildProcess>(std::vector<std::string>{VYRSERVICE_BINARY},
                                              ServiceEnv(dir_, g_work_dir + "/binder"),
                                              dir_ + "/service.log");
    }

    std::string dir_;
    std::chrono::steady_clock::time_point started_;
    std::shared_ptr<IVYRService> service_;
};

TEST_F(ServiceProcessTest, RegistersNoSoonerThanFourSecondsAfterStartAndServes) {
    auto process = StartService();
    ASSERT_GT(process->pid(), 0);
    ndk::SpAIBinder binder = WaitForRegistration(30s);
    ASSERT_NE(nullptr, binder.get()) << "vyrservice never registered";
    EXPECT_GE(std::chrono::steady_clock::now() - started_, 4s);
    service_ = IVYRService::fromBinder(binder);
    ASSERT_NE(nullptr, service_);

    // A fresh process draws its handles from the unseeded generator: the first draw is the
    // service's own display handle, the second the first client's.
    srand(1);
    const int32_t display_handle = rand() + 1;
    const int32_t first_client = rand() + 1;

    std::vector<int32_t> handles;
    for (int i = 0; i < 10; ++i) {
        int32_t handle = 0;
        ASSERT_TRUE(service_->Open(i % 2 == 0 ? 1 : 3, &handle).isOk());
        EXPECT_GT(handle, 0);
        EXPECT_NE(display_handle, handle);
        handles.push_back(handle);
    }
    EXPECT_EQ(first_client, handles[0]);
    int32_t result = 0;
    ASSERT_TRUE(service_->Open(3, &result).isOk());
    EXPECT_EQ(-1, result);
    ASSERT_TRUE(service_->Open(2, &result).isOk());
    EXPECT_EQ(-22, result);

    for (int32_t handle : {handles[0], handles[1]}) {
        ASSERT_TRUE(service_->Enable(handle, 100, &result).isOk());
        EXPECT_EQ(0, result);
        ASSERT_TRUE(service_->Enable(handle, 100, &result).isOk());
        EXPECT_EQ(-17, result);
    }
    for (int32_t handle : {handles[0], handles[1]}) {
        EXPECT_TRUE(service_->Disable(handle).isOk());
    }
    for (int32_t handle : handles) {
        EXPECT_TRUE(service_->Close(handle).isOk());
    }
    ASSERT_TRUE(service_->Enable(handles[0], 100, &result).isOk());
    EXPECT_EQ(-38, result);
    ASSERT_TRUE(service_->Open(3, &result).isOk());
    EXPECT_GT(result, 0);
    EXPECT_TRUE(service_->Close(result).isOk());
    EXPECT_TRUE(process->Running());
}

TEST_F(ServiceProcessTest, DeadCallbackClientIsDisabledAndClosed) {
    auto process = StartService();
    ndk::SpAIBinder binder = WaitForRegistration(30s);
    ASSERT_NE(nullptr, binder.get()) << "vyrservice never registered";
    service_ = IVYRService::fromBinder(binder);

    ChildProcess client({g_self, kCallbackClientFlag}, {{"VYR_BINDER_DIR", g_work_dir + "/binder"}},
                        dir_ + "/client.log");
    // The client reports its handle once it is enabled with a callback set twice.
    const std::optional<std::string> line = client.ReadLine(30s);
    ASSERT_TRUE(line && !line->empty()) << ReadFile(dir_ + "/client.log");
    const int32_t handle = std::stoi(*line);

    int32_t result = 0;
    ASSERT_TRUE(service_->Enable(handle, 100, &result).isOk());
    EXPECT_EQ(-17, result);

    client.Signal(SIGKILL);
    ASSERT_TRUE(client.Wait(10s));

    // Both death links fire; the first disables and closes, the second finds nothing.
    const auto deadline = std::chrono::steady_clock::now() + 10s;
    do {
        ASSERT_TRUE(service_->Enable(handle, 100, &result).isOk());
        if (result == -38) break;
        std::this_thread::sleep_for(20ms);
    } while (std::chrono::steady_clock::now() < deadline);
    EXPECT_EQ(-38, result);
    Event event{};
    ASSERT_TRUE(service_->PollOnce(handle, &event, &result).isOk());
    EXPECT_EQ(-22, result);

    // Still serving after every notice was handled.
    std::this_thread::sleep_for(200ms);
    ASSERT_TRUE(service_->Open(3, &result).isOk());
    EXPECT_GT(result, 0);
    EXPECT_TRUE(service_->Close(result).isOk());
    EXPECT_TRUE(process->Running());
    const std::string log = ReadFile(dir_ + "/service.log");
    EXPECT_NE(std::string::npos, log.find("client " + std::to_string(handle) +
                                          " mode 3 died; disable sensor and remove client handle"))
        << log;
}

TEST_F(ServiceProcessTest, RegistrationFailureLeavesAnUnreachableRunningProcess) {
    // A registry directory below a regular file cannot be created.
    const std::string blocker = dir_ + "/not-a-directory";
    std::ofstream(blocker) << "x";
    ChildProcess process({VYRSERVICE_BINARY}, ServiceEnv(dir_, blocker + "/binder"),
                         dir_ + "/service.log");
    ASSERT_TRUE(process.started());
    const auto deadline = std::chrono::steady_clock::now() + 30s;
    std::string log;
    while (std::chrono::steady_clock::now() < deadline) {
        log = ReadFile(dir_ + "/service.log");
        if (log.find("Failed to add vyrService with status: ") != std::string::npos) break;
        ASSERT_TRUE(process.Running()) << log;
        std::this_thread::sleep_for(20ms);
    }
    ASSERT_NE(std::string::npos, log.find("Failed to add vyrService with status: ")) << log;
    std::this_thread::sleep_for(500ms);
    EXPECT_TRUE(process.Running());
    ndk::SpAIBinder binder(AServiceManager_checkService(kServiceName));
    EXPECT_TRUE(binder.get() == nullptr || !AIBinder_isAlive(binder.get()));
}

TEST_F(ServiceProcessTest, VyrctlShellDrivesTheService) {
    auto process = StartService();
    ASSERT_NE(nullptr, WaitForRegistration(30s).get()) << "vyrservice never registered";

    ChildProcess shell({VYRCTL_BINARY, "--timeout", "10", "shell"},
                       {{"VYR_BINDER_DIR", g_work_dir + "/binder"}}, dir_ + "/vyrctl.log");
    ASSERT_TRUE(shell.started());
    // One command in, one result line out.
    auto run = [&](const std::string& command) -> std::string {
        EXPECT_TRUE(shell.WriteLine(command));
        std::optional<std::string> result = shell.ReadLine(10s);
        EXPECT_TRUE(result.has_value()) << command << "\n" << ReadFile(dir_ + "/vyrctl.log");
        return result.value_or("");
    };
    auto handle_of = [](const std::string& result) {
        const size_t arrow = result.find("-> ");
        return arrow == std::string::npos ? 0 : std::atoi(result.c_str() + arrow + 3);
    };

    std::vector<int32_t> handles;
    for (int i = 0; i < 10; ++i) {
        const std::string mode = i < 5 ? "1" : "3";
        const std::string result = run("open " + mode);
        EXPECT_EQ(0u, result.rfind("open " + mode + " -> ", 0)) << result;
        handles.push_back(handle_of(result));
        EXPECT_GT(handles.back(), 0) << result;
    }
    EXPECT_EQ(0u, run("open 3").rfind("open 3 -> -1", 0));
    EXPECT_EQ(0u, run("open 2").rfind("open 2 -> -22", 0));

    const std::string als = std::to_string(handles[0]);
    const std::string range = std::to_string(handles[5]);
    EXPECT_EQ("enable " + als + " 100 -> 0", run("enable " + als + " 100"));
    EXPECT_EQ("enable " + range + " 100 -> 0", run("enable " + range + " 100"));
    EXPECT_EQ(0u, run("enable " + range + " 100").rfind("enable " + range + " 100 -> -17", 0));
    EXPECT_EQ("disable " + als + " -> ok", run("disable " + als));
    EXPECT_EQ("disable " + range + " -> ok", run("disable " + range));
    for (int32_t handle : handles) {
        const std::string h = std::to_string(handle);
        EXPECT_EQ("close " + h + " -> ok", run("close " + h));
    }
    EXPECT_EQ(0u, run("enable " + range + " 100").rfind("enable " + range + " 100 -> -38", 0));
    const std::string reopened = run("open 3");
    EXPECT_GT(handle_of(reopened), 0) << reopened;
    EXPECT_EQ("close " + std::to_string(handle_of(reopened)) + " -> ok",
              run("close " + std::to_string(handle_of(reopened))));

    EXPECT_TRUE(shell.WriteLine("quit"));
    shell.CloseStdin();
    // Wait status 0: it exited by itself with status 0.
    EXPECT_EQ(std::optional<int>(0), shell.Wait(10s));
    EXPECT_TRUE(process->Running());
}

// Child role: a client that enables range events with a callback set twice, reports its handle
// on stdout and waits to be killed.
int RunCallbackClient() {
    ABinderProcess_startThreadPool();
    ndk::SpAIBinder binder(AServiceManager_checkService(kServiceName));
    auto service = IVYRService::fromBinder(binder);
    if (!service) {
        fprintf(stderr, "no service\n");
        return 2;
    }
    int32_t handle = 0;
    int32_t result = 0;
    auto callback = ndk::SharedRefBase::make<vyr_test::IgnoringCallback>();
    if (!service->Open(3, &handle).isOk() || handle <= 0 ||
        !service->SetCallback(handle, callback, &result).isOk() || result != 0 ||
        !service->SetCallback(handle, callback, &result).isOk() || result != 0 ||
        !service->Enable(handle, 100, &result).isOk() || result != 0) {
        fprintf(stderr, "setup failed: handle %d result %d\n", handle, result);
        return 3;
    }
    printf("%d\n", handle);
    fflush(stdout);
    char c;
    while (read(0, &c, 1) > 0) {
    }
    return 0;
}

}  // namespace
}  // namespace vyr_test::service

int main(int argc, char** argv) {
    using namespace vyr_test::service;
    g_self = std::filesystem::canonical("/proc/self/exe").string();
    if (argc > 1 && strcmp(argv[1], kCallbackClientFlag) == 0) {
        return RunCallbackClient();
    }
    ::testing::InitGoogleTest(&argc, argv);
    g_work_dir = vyr_test::MakeTempDir("vyr-service-process-");
    std::filesystem::create_directory(g_work_dir + "/binder");
    setenv("VYR_BINDER_DIR", (g_work_dir + "/binder").c_str(), 1);
    const int status = RUN_ALL_TESTS();
    std::filesystem::remove_all(g_work_dir);
    return status;
}
