// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <memory>
#include <thread>

#include "child_process.h"
#include "sandboxed_service.h"
#include "shell_client.h"
#include "test_files.h"

namespace vyr_test::e2e {
namespace {

using namespace std::chrono_literals;

constexpr char kAlsProperty[] = "persist.vendor.camera.vyr_supported";
constexpr char kRangeProperty[] = "persist.vendor.camera.vyr_range_supported";
constexpr char kApexTag[] = "apex_update_listener";
constexpr char kModified[] = "/apex/apex-info-list.xml modified as file";
constexpr char kRestarting[] = "APEX version updated. Restarting.";
constexpr auto kWait = 10s;
// vyr-sandbox's status when it may not create namespaces.
constexpr int kSandboxNoPrivilege = 77;
constexpr size_t kApexListSize = 1024;

bool UnderCi() {
    const char* ci = getenv("CI");
    return ci != nullptr && std::string(ci) == "true";
}

// An APEX info list with the camera HAL package and one other package, always kApexListSize
// bytes long, so that a rewrite is one write() over the old content: one IN_MODIFY.
std::string ApexList(int hal_version, int other_version, bool compact = false) {
    const std::string hal = std::to_string(hal_version);
    const std::string other = std::to_string(other_version);
    const std::string gap = compact ? "\n" : "\n    ";
    std::string text =
        "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<apex-info-list>" + gap +
        "<apex-info moduleName=\"com.tarven.nomil.camera.hal\" "
        "modulePath=\"/data/apex/active/com.tarven.nomil.camera.hal@" +
        hal +
        ".apex\" preinstalledModulePath=\"/vendor/apex/com.tarven.nomil.camera.hal.apex\" "
        "versionCode=\"" +
        hal + "\" versionName=\"" + hal + "\" isFactory=\"false\" isActive=\"true\"/>" + gap +
        "<apex-info moduleName=\"com.android.media\" "
        "modulePath=\"/system/apex/com.android.media.apex\" versionCode=\"" +
        other + "\" versionName=\"" + other + "\" isFactory=\"true\" isActive=\"true\"/>\n";
    const std::string end = "</apex-info-list>\n";
    text.append(kApexListSize - text.size() - end.size(), ' ');
    return text + end;
}

std::string EnableLine(const std::string& shown) {
    return "Enable sensor for display state: " + shown;
}

std::string DisableLine(const std::string& shown) {
    return "Disable sensor for display state: " + shown;
}

class E2eTest : public ::testing::Test {
  protected:
    void SetUp() override {
        if (geteuid() != 0) Unavailable("needs root to run the service in vyr-sandbox");
    }

    void Unavailable(const std::string& why) {
        if (UnderCi()) GTEST_FAIL() << why;
        GTEST_SKIP() << why;
    }

    // Starts the service; returns null (having failed or skipped the test) if it does not run.
    std::unique_ptr<SandboxedService> Start(SandboxedService::Options options) {
        if (options.apex_list.empty()) options.apex_list = ApexList(1, 5);
        auto service = std::make_unique<SandboxedService>(options);
        if (!service->problem().empty()) {
            const std::string suffix = "(exit status " + std::to_string(kSandboxNoPrivilege) + ")";
            if (service->problem().find(suffix) != std::string::npos) {
                Unavailable(service->problem());
            } else {
                ADD_FAILURE() << service->problem();
            }
            return nullptr;
        }
        return service;
    }

    std::unique_ptr<ShellClient> Client(const SandboxedService& service, const std::string& name) {
        return std::make_unique<ShellClient>(service.ClientEnvironment(),
                                             service.dir() + "/" + name + ".log");
    }

    // Opens `mode` through `client` as the first call to a fresh service, and checks that the
    // service took at least its 4-second start-up delay to become reachable.
    std::optional<int64_t> FirstOpen(const SandboxedService& service, ShellClient& client,
                                     int mode) {
        const std::optional<int64_t> result = client.Call("open " + std::to_string(mode));
        const auto reachable_after = std::chrono::steady_clock::now() - service.started_at();
        EXPECT_GE(reachable_after, 4s);
        EXPECT_LT(reachable_after, 20s);
        return result;
    }
};

TEST_F(E2eTest, PanelStateDrivesTheLightSensor) {
    auto service = Start({"Off", {{kAlsProperty, "true"}}, ""});
    if (service == nullptr) return;
    auto client = Client(*service, "client");
    const std::optional<int64_t> handle = FirstOpen(*service, *client, 1);
    ASSERT_TRUE(handle);
    ASSERT_GT(*handle, 0);
    const std::string poll = "poll " + std::to_string(*handle);
    ASSERT_TRUE(service->MonitorWatching());

    // Dark: nothing samples, so there is nothing to take.
    EXPECT_EQ(-61, client->Call(poll));
    EXPECT_NE("1", service->SensorState()["als.enabled"]);

    // Lit: the light sensor samples for the display; a client that only opened gets readings.
    ASSERT_TRUE(service->Panel("On"));
    EXPECT_TRUE(client->CallUntil(poll, 0, kWait));
    EXPECT_TRUE(service->WaitForSensorState("als.enabled", "1", kWait));

    // More lit notifications, each read by the monitor (its read position shows it), enable
    // nothing more.
    ASSERT_TRUE(service->Panel("On On"));
    ASSERT_TRUE(service->WaitForMonitorRead(6, kWait));
    ASSERT_TRUE(service->Panel("HBM"));
    ASSERT_TRUE(service->WaitForMonitorRead(4, kWait));

    // Dark again: the sensor is switched off and the last sample, once taken, is the last.
    ASSERT_TRUE(service->Panel("Off"));
    ASSERT_TRUE(service->WaitForLog("vyrservice", 'I', DisableLine("Off\n"), kWait));
    EXPECT_TRUE(service->WaitForSensorState("als.enabled", "0", kWait));
    EXPECT_TRUE(client->CallUntil(poll, -61, kWait));
    auto log = service->Log();
    EXPECT_EQ(1u, CountRecords(log, "vyrservice", 'I', EnableLine("On\n")));
    EXPECT_EQ(0u, CountRecords(log, "vyrservice", 'I', EnableLine("On On\n")));
    EXPECT_EQ(0u, CountRecords(log, "vyrservice", 'I', EnableLine("HBM\n")));

    // HBM from dark counts as lit.
    ASSERT_TRUE(service->Panel("HBM"));
    ASSERT_TRUE(service->WaitForLog("vyrservice", 'I', EnableLine("HBM\n"), kWait));
    EXPECT_TRUE(service->WaitForSensorState("als.enabled", "1", kWait));
    EXPECT_TRUE(client->CallUntil(poll, 0, kWait));
    ASSERT_TRUE(service->Panel("Off"));
    ASSERT_TRUE(service->WaitForLog("vyrservice", 'I', DisableLine("Off\n"), kWait, 2));
    EXPECT_TRUE(service->WaitForSensorState("als.enabled", "0", kWait));
    EXPECT_EQ(0, client->Call("close " + std::to_string(*handle)));
}

TEST_F(E2eTest, CameraHalApexChangeRestartsTheProcess) {
    auto service = Start({"Off", {}, ApexList(1, 5)});
    if (service == nullptr) return;
    auto client = Client(*service, "client");
    const std::optional<int64_t> handle = FirstOpen(*service, *client, 3);
    ASSERT_TRUE(handle);
    ASSERT_GT(*handle, 0);

    // Changes that leave the camera HAL's records as they are: another package's entry, the
    // same bytes again, other white space.
    const std::vector<std::string> unchanged = {ApexList(1, 6), ApexList(1, 6),
                                                ApexList(1, 6, true)};
    for (size_t i = 0; i < unchanged.size(); ++i) {
        ASSERT_TRUE(service->WriteApexList(unchanged[i]));
        ASSERT_TRUE(service->WaitForLog(kApexTag, 'I', kModified, kWait, i + 1)) << i;
    }
    EXPECT_EQ(0u, CountRecords(service->Log(), "vyrservice_main", 'I', kRestarting));

    // The camera HAL's version changes: the process logs and exits with status 0.
    ASSERT_TRUE(service->WriteApexList(ApexList(2, 6, true)));
    const std::optional<int> status = service->WaitForExit(kWait);
    ASSERT_TRUE(status);
    EXPECT_EQ(0, *status);

    // Every earlier change was handled by a process that went on: the restart follows the
    // event of the last change, which the process lived to log.
    const auto log = service->Log();
    EXPECT_EQ(unchanged.size() + 1, CountRecords(log, kApexTag, 'I', kModified));
    EXPECT_EQ(1u, CountRecords(log, "vyrservice_main", 'I', kRestarting));
    int last_modified = -1;
    for (int i = FindRecord(log, kApexTag, 'I', kModified); i >= 0;
         i = FindRecord(log, kApexTag, 'I', kModified, i + 1)) {
        last_modified = i;
    }
    EXPECT_GT(FindRecord(log, "vyrservice_main", 'I', kRestarting), last_modified);
}

TEST_F(E2eTest, UnderAnInitLikeRestartAStreamGoesOnAcrossTheApexUpdate) {
    SandboxedService::Options options{"Off", {}, ApexList(1, 5)};
    options.restart = true;
    auto service = Start(options);
    if (service == nullptr) return;
    const pid_t first_pid = service->service_pid();
    const std::string stream_errors = service->dir() + "/stream.err";
    vyr_test::ChildProcess stream({VYRCTL_PATH, "stream", "range", "--callback", "--period", "100"},
                                  service->ClientEnvironment(), stream_errors);
    ASSERT_TRUE(stream.ReadLine(20s)) << vyr_test::ReadFile(stream_errors);

    ASSERT_TRUE(service->WriteApexList(ApexList(2, 5)));
    const std::optional<int> status = service->WaitForExit(kWait);
    ASSERT_TRUE(status);
    EXPECT_EQ(0, *status);
    const std::optional<pid_t> second_pid = service->WaitForRestart(kWait);
    ASSERT_TRUE(second_pid) << "the sandbox did not start the service again";
    EXPECT_NE(*second_pid, first_pid);
    // The stream resumes on the new instance and says so.
    const auto deadline = std::chrono::steady_clock::now() + 30s;
    while (vyr_test::ReadFile(stream_errors).find("service restarted: handle ") ==
           std::string::npos) {
        ASSERT_LT(std::chrono::steady_clock::now(), deadline) << vyr_test::ReadFile(stream_errors);
        std::this_thread::sleep_for(20ms);
    }
    while (stream.ReadLine(0ms)) {
    }
    EXPECT_TRUE(stream.ReadLine(kWait)) << "no event from the new instance";
    EXPECT_TRUE(stream.Running());
}

TEST_F(E2eTest, AmbientLightPropertyOffMeansNoDisplayMonitorAndDeadClientsAreSwitchedOff) {
    auto service = Start({"Off", {{kAlsProperty, "false"}}, ""});
    if (service == nullptr) return;
    auto client = Client(*service, "client");
    EXPECT_EQ(-19, FirstOpen(*service, *client, 1));
    // No monitor: nothing watches the state attribute and a lit panel changes nothing.
    EXPECT_FALSE(service->MonitorWatching());
    ASSERT_TRUE(service->Panel("On"));

    // A range client with a callback, enabled, then killed.
    auto victim = Client(*service, "victim");
    const std::optional<int64_t> handle = victim->Call("open 3");
    ASSERT_TRUE(handle);
    ASSERT_GT(*handle, 0);
    const std::string h = std::to_string(*handle);
    ASSERT_EQ(0, victim->Call("callback " + h));
    ASSERT_EQ(0, victim->Call("enable " + h + " 100"));
    ASSERT_TRUE(service->WaitForSensorState("range.enabled", "1", kWait));
    victim->process().Signal(SIGKILL);
    ASSERT_TRUE(victim->process().Wait(kWait));

    EXPECT_TRUE(service->WaitForSensorState("range.enabled", "0", kWait));
    EXPECT_TRUE(service->WaitForLog(
        "vyrservice", 'I', "client " + h + " mode 3 died; disable sensor and remove client handle",
        kWait));
    // The handle is gone for everyone.
    EXPECT_EQ(-22, client->Call("poll " + h));

    const auto log = service->Log();
    EXPECT_EQ(1u, CountRecords(log, "vyrservice", 'W', "SpectralSensor::Create() returned NULL."));
    EXPECT_EQ(0u, CountRecords(log, "vyrservice", 'I', EnableLine("On\n")));
    EXPECT_FALSE(service->MonitorWatching());
}

TEST_F(E2eTest, RangePropertyOffRefusesTheRangeMode) {
    auto service = Start({"Off", {{kAlsProperty, "true"}, {kRangeProperty, "false"}}, ""});
    if (service == nullptr) return;
    auto client = Client(*service, "client");
    EXPECT_EQ(-19, FirstOpen(*service, *client, 3));
    const std::optional<int64_t> light = client->Call("open 1");
    ASSERT_TRUE(light);
    EXPECT_GT(*light, 0);
    EXPECT_EQ(1u, CountRecords(service->Log(), "vyrservice", 'W',
                               "ubk::RangeSensor::Create() returned NULL."));
    EXPECT_EQ(0, client->Call("close " + std::to_string(*light)));
}

}  // namespace
}  // namespace vyr_test::e2e
