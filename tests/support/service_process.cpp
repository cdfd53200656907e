// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_process.h"

#include <android/binder_manager.h>
#include <signal.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <thread>

#include "test_files.h"

namespace vyr_test {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

namespace {

constexpr milliseconds kPollInterval{50};

}  // namespace

ServiceProcess::ServiceProcess() {
    dir_ = MakeTempDir("vyr-service.");
    if (dir_.empty()) return;
    std::filesystem::create_directory(dir_ + "/binder");
    std::ofstream(dir_ + "/build.prop") << "persist.vendor.camera.vyr_supported=true\n"
                                           "persist.vendor.camera.vyr_range_supported=true\n";
}

ServiceProcess::~ServiceProcess() {
    Stop();
    if (!dir_.empty()) {
        std::error_code ignored;
        std::filesystem::remove_all(dir_, ignored);
    }
}

std::map<std::string, std::string> ServiceProcess::ClientEnvironment() const {
    return {{"VYR_BINDER_DIR", dir_ + "/binder"}};
}

bool ServiceProcess::Start(const std::string& binary) {
    if (dir_.empty()) return false;
    // This process is a client of the same registry; set before its first binder call.
    setenv("VYR_BINDER_DIR", (dir_ + "/binder").c_str(), 1);
    std::map<std::string, std::string> env = ClientEnvironment();
    env["VYR_PROPERTY_FILE"] = dir_ + "/build.prop";
    env["VYR_SENSOR_STATE_FILE"] = dir_ + "/sensor_state";
    process_ = std::make_unique<ChildProcess>(std::vector<std::string>{binary}, env,
                                              dir_ + "/vyrservice.log");
    return process_->started();
}

std::shared_ptr<aidl::android::vyr::IVYRService> ServiceProcess::WaitForService(milliseconds timeout) {
    auto deadline = steady_clock::now() + timeout;
    while (Running()) {
        ndk::SpAIBinder binder(AServiceManager_checkService("vyrservice"));
        if (binder.get() != nullptr) return aidl::android::vyr::IVYRService::fromBinder(binder);
        if (steady_clock::now() >= deadline) break;
        std::this_thread::sleep_for(kPollInterval);
    }
    return nullptr;
}

void ServiceProcess::Stop() {
    if (process_ == nullptr) return;
    process_->Signal(SIGTERM);
    if (!process_->Wait(milliseconds(5000))) {
        process_->Signal(SIGKILL);
        process_->Wait(milliseconds(5000));
    }
    process_.reset();
}

bool ServiceProcess::Running() {
    return process_ != nullptr && process_->Running();
}

std::map<std::string, std::string> ServiceProcess::SensorState() const {
    return ReadKeyValues(dir_ + "/sensor_state");
}

bool ServiceProcess::WaitForSensorState(const std::string& key, const std::string& value,
                                        milliseconds timeout) const {
    auto deadline = steady_clock::now() + timeout;
    while (true) {
        auto state = SensorState();
        auto it = state.find(key);
        if (it != state.end() && it->second == value) return true;
        if (steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(kPollInterval);
    }
}

std::string ServiceProcess::Log() const {
    return ReadFile(dir_ + "/vyrservice.log");
}

bool ServiceProcess::WaitForLog(const std::string& text, milliseconds timeout) const {
    auto deadline = steady_clock::now() + timeout;
    while (Log().find(text) == std::string::npos) {
        if (steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(kPollInterval);
    }
    return true;
}

long ServiceProcess::RssKib() const {
    return ResidentKib(pid());
}

size_t ServiceProcess::LogCount(const std::string& text) const {
    const std::string log = Log();
    size_t count = 0;
    for (size_t at = log.find(text); at != std::string::npos; at = log.find(text, at + 1)) ++count;
    return count;
}

}  // namespace vyr_test
