// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <fstream>
#include <thread>

#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_fixture.h"
#include "test_files.h"
#include "thread_count.h"

namespace vyr_test::service {
namespace {

using namespace std::chrono_literals;
using android::vyr::binder::ServiceConfig;

using sensor_doubles::Calls;
using sensor_doubles::CountOf;
using sensor_doubles::kAlsCreate;
using sensor_doubles::kAlsDestroy;
using sensor_doubles::kRangeCreate;
using sensor_doubles::kRangeDestroy;
using sensor_doubles::kRangeEnable;
using sensor_doubles::kRangeInit;

using LifecycleTest = ServiceFixture;

constexpr char kAlsMissing[] = "SpectralSensor::Create() returned NULL.";
constexpr char kRangeMissing[] = "ubk::RangeSensor::Create() returned NULL.";

std::vector<std::string> CallNames() {
    std::vector<std::string> names;
    for (const auto& call : Calls()) names.push_back(call.name);
    return names;
}

// A FIFO as display-state file: its reader blocks in open() until a writer comes, which shows
// whether the display monitor runs.
class Fifo {
  public:
    Fifo() {
        dir_ = vyr_test::MakeTempDir("vyr-service-test-");
        path_ = dir_ + "/state";
        mkfifo(path_.c_str(), 0600);
    }
    ~Fifo() {
        unlink(path_.c_str());
        rmdir(dir_.c_str());
    }
    const std::string& path() const { return path_; }
    // A writer can open the FIFO only while it has a reader, also one still blocked in its own
    // open(), which the writer's open then completes.
    bool HasReader() const {
        const int fd = open(path_.c_str(), O_WRONLY | O_NONBLOCK | O_CLOEXEC);
        if (fd < 0) return false;
        close(fd);
        return true;
    }
    bool WaitForReader(std::chrono::milliseconds timeout) const {
        const auto deadline = std::chrono::steady_clock::now() + timeout;
        while (!HasReader()) {
            if (std::chrono::steady_clock::now() >= deadline) return false;
            std::this_thread::sleep_for(2ms);
        }
        return true;
    }

  private:
    std::string dir_;
    std::string path_;
};

TEST_F(LifecycleTest, PropertiesDefaultToRangeOnlyAndNoDisplayMonitor) {
    Fifo display;
    MakeService(Config({}, display.path()));
    EXPECT_EQ((std::vector<std::string>{kRangeCreate}), CallNames());
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_WARN, kAlsMissing));
    EXPECT_FALSE(log_.Contains(kTag, ANDROID_LOG_WARN, kRangeMissing));
    // Only the range worker: a display monitor would sit in open() on the FIFO.
    EXPECT_EQ(baseline_threads_ + 1, ThreadCount());
    EXPECT_FALSE(display.HasReader());
    EXPECT_EQ(-19, Open(1));
    EXPECT_GT(Open(3), 0);
}

TEST_F(LifecycleTest, PropertiesReadWithTheirDefaults) {
    std::vector<std::pair<std::string, bool>> asked;
    ServiceConfig config = Config({});
    config.get_bool_property = [&asked](const char* key, bool default_value) {
        asked.emplace_back(key, default_value);
        return default_value;
    };
    MakeService(config);
    EXPECT_EQ(
        (std::vector<std::pair<std::string, bool>>{{kAlsProperty, false}, {kRangeProperty, true}}),
        asked);
}

TEST_F(LifecycleTest, AmbientLightPropertyWithFailingCreateStillMonitorsTheDisplay) {
    sensor_doubles::SetAlsCreateFails(true);
    Fifo display;
    MakeService(Config({{kAlsProperty, true}}, display.path()));
    EXPECT_EQ((std::vector<std::string>{kAlsCreate, kRangeCreate}), CallNames());
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_WARN, kAlsMissing));
    // The probing writer also lets the monitor's open() return; it then finds no sensor.
    ASSERT_TRUE(display.WaitForReader(kWait));
    EXPECT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_ERROR,
                             "MonitorDisplayStatus: ALS sensor unavailable", kWait));
    // Left: the range worker alone.
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_ + 1, kWait));
    EXPECT_EQ(-19, Open(1));
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_ERROR, "Open als sensor unavailable"));
}

TEST_F(LifecycleTest, UnopenableDisplayFileEndsTheMonitor) {
    MakeService(true, true);
    EXPECT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_ERROR,
                             "vyrservice cannot open the display state file for reading.: No "
                             "such file or directory",
                             kWait));
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_ + 2, kWait));
}

TEST_F(LifecycleTest, RangePropertyOffOrCreateFailing) {
    MakeService(Config({{kRangeProperty, false}}));
    EXPECT_TRUE(Calls().empty());
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_WARN, kRangeMissing));
    EXPECT_EQ(baseline_threads_, ThreadCount());
    DestroyService();

    sensor_doubles::Reset();
    log_.Clear();
    sensor_doubles::SetRangeCreateFails(true);
    MakeService(Config({}));
    EXPECT_EQ(1u, CountOf(kRangeCreate));
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_WARN, kRangeMissing));
    EXPECT_EQ(baseline_threads_, ThreadCount());
    EXPECT_EQ(-19, Open(3));
}

TEST_F(LifecycleTest, DestructionDestroysBothSensorsEvenWhenNeitherExists) {
    MakeService(false, false);
    DestroyService();
    EXPECT_EQ((std::vector<std::string>{kAlsDestroy, kRangeDestroy}), CallNames());
}

TEST_F(LifecycleTest, DestructionStopsWorkersThenDestroysSensors) {
    MakeService(true, true);
    ASSERT_TRUE(WaitForThreadCount(baseline_threads_ + 2, kWait));
    DestroyService();
    // Joined: gone at once natively, a moment later under qemu-user.
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_, kWait)) << vyr_test::ThreadNames();
    EXPECT_EQ((std::vector<std::string>{kAlsCreate, kRangeCreate, kAlsDestroy, kRangeDestroy}),
              CallNames());
}

// True once the thread sleeps (state S), which for the destroying thread means it waits in a
// join and has therefore already told the workers to stop.
bool WaitUntilSleeping(pid_t tid, std::chrono::milliseconds timeout) {
    const std::string path = "/proc/self/task/" + std::to_string(tid) + "/stat";
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (std::chrono::steady_clock::now() < deadline) {
        std::ifstream stat(path);
        std::string text((std::istreambuf_iterator<char>(stat)), std::istreambuf_iterator<char>());
        const size_t paren = text.rfind(')');
        if (paren != std::string::npos && paren + 2 < text.size() && text[paren + 2] == 'S') {
            return true;
        }
        std::this_thread::sleep_for(2ms);
    }
    return false;
}

TEST_F(LifecycleTest, QueuedItemsAreDiscardedAtDestruction) {
    // The first item stops in Init and starts no processing thread once released.
    sensor_doubles::SetResult(kRangeInit, -1);
    sensor_doubles::Hold(kRangeInit);
    MakeService(false, true);
    const int32_t first = Open(3);
    const int32_t second = Open(3);
    ASSERT_EQ(0, Enable(first, 100));
    ASSERT_TRUE(sensor_doubles::WaitUntilHeld(kRangeInit, kWait));
    ASSERT_EQ(0, Enable(second, 100));

    std::atomic<pid_t> destroyer{0};
    std::thread destroy([this, &destroyer] {
        destroyer = static_cast<pid_t>(syscall(SYS_gettid));
        service_.reset();
    });
    while (destroyer == 0) std::this_thread::yield();
    EXPECT_TRUE(WaitUntilSleeping(destroyer, kWait));
    sensor_doubles::Release(kRangeInit);
    destroy.join();

    EXPECT_EQ(1u, CountOf(kRangeInit));
    EXPECT_EQ(1u, CountOf(kRangeEnable));
    EXPECT_EQ(0u, WorkLogCount("EnableWork", second));
    EXPECT_EQ(1u, CountOf(kRangeDestroy));
}

TEST_F(LifecycleTest, OpenClientsAreReleasedAtDestruction) {
    sensor_doubles::SetResult(kRangeInit, -1);
    MakeService(false, true);
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    const int32_t enabled = Open(3);
    const int32_t idle = Open(3);
    int32_t result = 1;
    ASSERT_TRUE(service_->SetCallback(enabled, callback, &result).isOk());
    ASSERT_EQ(0, result);
    ASSERT_TRUE(service_->SetCallback(idle, callback, &result).isOk());
    ASSERT_EQ(0, Enable(enabled, 20));
    ASSERT_TRUE(WaitForWorkLog("EnableWork", enabled));
    ASSERT_EQ(baseline_threads_ + 2, ThreadCount());  // range worker and notification thread
    DestroyService();
    // Joined during the destruction, not merely told to stop (the count reaches the baseline a
    // moment after the join under qemu-user; a thread only told to stop would keep it above).
    EXPECT_TRUE(WaitForThreadCount(baseline_threads_, kWait)) << vyr_test::ThreadNames();
    EXPECT_EQ(1, callback.use_count());
}

TEST(ServiceConfigTest, ProductionConfiguration) {
    const ServiceConfig config = ServiceConfig::Production();
    EXPECT_EQ(std::chrono::milliseconds(4000), config.startup_delay);
    EXPECT_EQ("/sys/class/backlight/panel0-backlight/state", config.display_state_path);
    ASSERT_TRUE(config.get_bool_property);
}

}  // namespace
}  // namespace vyr_test::service
