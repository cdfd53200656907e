// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "display_fixture.h"

#include <android/log.h>
#include <dirent.h>
#include <limits.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <future>
#include <thread>

#include "sensor_doubles.h"
#include "uts_namespace.h"
#include "work_log.h"

namespace vyr_test::display {
namespace {

bool UnderCi() {
    const char* ci = getenv("CI");
    return ci != nullptr && std::string(ci) == "true";
}

bool WaitUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (!condition()) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(2ms);
    }
    return true;
}

// The descriptor on which the display monitor watches the attribute (the test itself never keeps
// one open), or -1.
int MonitorDescriptor() {
    DIR* dir = opendir("/proc/self/fd");
    if (dir == nullptr) return -1;
    int found = -1;
    while (dirent* entry = readdir(dir)) {
        char target[PATH_MAX];
        const std::string link = std::string("/proc/self/fd/") + entry->d_name;
        const ssize_t length = readlink(link.c_str(), target, sizeof(target) - 1);
        if (length > 0 && std::string(target, length) == kStatePath) found = atoi(entry->d_name);
    }
    closedir(dir);
    return found;
}

}  // namespace

void DisplayTest::SetUp() {
    if (!HaveOwnUtsNamespace()) {
        if (UnderCi()) GTEST_FAIL() << UtsNamespaceProblem();
        GTEST_SKIP() << UtsNamespaceProblem();
    }
    ServiceFixture::SetUp();
    // Built with the panel dark, the service starts with the light sensor off.
    display_path_ = kStatePath;
    Panel("Off");
}

void DisplayTest::TearDown() {
    if (!HaveOwnUtsNamespace()) return;
    if (service_ != nullptr) {
        // A test that failed while the panel was lit: stop the display's sampling first, since
        // destruction does not stop processing threads.
        if (fuse_ != nullptr) {
            fuse_->FailReads(0);
            fuse_->Set("Off");
        } else if (panel_ != "Off") {
            Panel("Off");
        }
        WaitForBlock(kAlsBlock, [](const vyr_test::ModeBlockSnapshot& block) {
            return block.enable_count <= 0 && !block.running;
        });
    }
    EXPECT_TRUE(DestroyService());
    fuse_.reset();
    sensor_doubles::Reset();
    ServiceFixture::TearDown();
}

void DisplayTest::MakeServiceOnFuse() {
    if (!HavePrivateMounts()) {
        if (UnderCi()) GTEST_FAIL() << "no private mount namespace for a FUSE mount";
        GTEST_SKIP() << "no private mount namespace for a FUSE mount";
    }
    fuse_ = std::make_unique<FuseAttribute>();
    if (!fuse_->problem().empty()) {
        const std::string problem = fuse_->problem();
        fuse_.reset();
        if (UnderCi()) GTEST_FAIL() << problem;
        GTEST_SKIP() << problem;
    }
    display_path_ = fuse_->path();
    MakeService();
}

bool DisplayTest::DestroyService() {
    if (service_ == nullptr) return true;
    std::future<void> destroyed = StartDestruction();
    // Each notification lets the monitor look at the service's running flag once more.
    if (!NotifyUntil([&] { return destroyed.wait_for(0s) == std::future_status::ready; }, kWait)) {
        ADD_FAILURE() << "the service was not destroyed within " << kWait.count() << " s";
        // The destruction may still use the doubles and the log capture: wait for it regardless.
        destroyed.wait();
        return false;
    }
    return true;
}

void DisplayTest::Panel(const std::string& state) {
    panel_ = state;
    ASSERT_EQ(0, sethostname(state.data(), state.size())) << strerror(errno);
}

bool DisplayTest::MonitorWatching() {
    return MonitorDescriptor() >= 0;
}

bool DisplayTest::WaitForMonitorWatching(bool watching) {
    return WaitUntil([watching] { return MonitorWatching() == watching; }, kWait);
}

size_t DisplayTest::EnableLines(const std::string& shown) {
    return log_.Count(kTag, ANDROID_LOG_INFO, "Enable sensor for display state: " + shown);
}

size_t DisplayTest::DisableLines(const std::string& shown) {
    return log_.Count(kTag, ANDROID_LOG_INFO, "Disable sensor for display state: " + shown);
}

bool DisplayTest::WaitForEnableLine(const std::string& shown, size_t count) {
    return log_.WaitFor(kTag, ANDROID_LOG_INFO, "Enable sensor for display state: " + shown, kWait,
                        count);
}

bool DisplayTest::WaitForDisableLine(const std::string& shown, size_t count) {
    return log_.WaitFor(kTag, ANDROID_LOG_INFO, "Disable sensor for display state: " + shown, kWait,
                        count);
}

bool DisplayTest::WaitForMonitorRead(size_t length) {
    return WaitUntil(
        [length] {
            const int fd = MonitorDescriptor();
            if (fd < 0) return false;
            std::ifstream info("/proc/self/fdinfo/" + std::to_string(fd));
            std::string key;
            size_t position = 0;
            return static_cast<bool>(info >> key >> position) && key == "pos:" && position == length;
        },
        kWait);
}

bool DisplayTest::WaitForBlock(
    size_t index, const std::function<bool(const vyr_test::ModeBlockSnapshot&)>& condition) {
    return WaitUntil(
        [&] { return condition(vyr_test::ServicePeer::SnapshotModeBlock(*service_, index)); },
        kWait);
}

bool DisplayTest::WaitForEnableCount(int32_t count) {
    return WaitForBlock(kAlsBlock, [count](const vyr_test::ModeBlockSnapshot& block) {
        return block.enable_count == count;
    });
}

std::future<void> DisplayTest::StartDestruction() {
    return std::async(std::launch::async,
                      [service = std::move(service_)]() mutable { service.reset(); });
}

bool DisplayTest::NotifyUntil(const std::function<bool()>& done, std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (!done()) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        if (fuse_ != nullptr) {
            fuse_->Notify();
        } else {
            Panel(panel_);
        }
        std::this_thread::sleep_for(20ms);
    }
    return true;
}

std::string DisplayTest::EnableWorkText(int32_t count, int32_t handle, int32_t period,
                                        int32_t active) {
    return vyr_test::EnableWorkLine(1, count, handle, period, active, 0);
}

std::string DisplayTest::DisableWorkText(int32_t count, int32_t handle, int32_t active) {
    return vyr_test::DisableWorkLine(1, count, handle, active, 0);
}

int32_t DisplayTest::DisplayHandle() {
    const auto block = vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock);
    EXPECT_EQ(1u, block.periods.size());
    return block.periods.empty() ? 0 : block.periods.begin()->first;
}

}  // namespace vyr_test::display
