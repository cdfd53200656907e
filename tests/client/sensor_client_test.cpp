// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The client library: attaching with every setting, re-attaching after the service's restart,
// refusals, giving up, stopping at any moment; and vyrctl stream across a restart of the real
// service.

#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <vyr/binder_host.h>
#include <vyr/sensor_client.h>

#include <chrono>
#include <condition_variable>
#include <fstream>
#include <functional>
#include <memory>
#include <mutex>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "child_process.h"
#include "service_process.h"
#include "temp_dir.h"
#include "test_service.h"
#include "thread_count.h"

namespace vyr_test::client {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;
using vyr::SensorClient;

constexpr milliseconds kWait{10000};
// The real service waits 4 s before it registers; sanitizer builds start slower still.
constexpr milliseconds kRegistration{30000};
const std::vector<int32_t> kControlValues = {30, 20, 5, 10, 1, 0, 1, 2, 40, 4000, 16};

// What the client told the application.
class Recorder : public vyr::SensorClientListener {
  public:
    struct Resumed {
        int32_t old_handle;
        int32_t new_handle;
    };
    struct Refusal {
        int32_t result;
        int attempt;
        milliseconds retry_in;
    };

    void OnEvent(const Event& event) override {
        Add([&] { events_.push_back(event); });
    }
    void OnServiceLost(int32_t handle) override {
        Add([&] { lost_.push_back(handle); });
    }
    void OnOpenRefused(int32_t result, int attempt, milliseconds retry_in) override {
        Add([&] { refusals_.push_back({result, attempt, retry_in}); });
    }
    void OnResumed(int32_t old_handle, int32_t new_handle, milliseconds /*since*/) override {
        Add([&] { resumed_.push_back({old_handle, new_handle}); });
    }
    void OnGaveUp(const std::string& reason) override {
        Add([&] { gave_up_.push_back(reason); });
    }
    void OnSettingRefused(const std::string& setting, int32_t result) override {
        Add([&] { refused_settings_.push_back(setting + " " + std::to_string(result)); });
    }

    bool WaitFor(const std::function<bool()>& condition) {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kWait, condition);
    }
    size_t EventCount() {
        std::lock_guard<std::mutex> lock(mutex_);
        return events_.size();
    }
    bool WaitForEvents(size_t count) {
        return WaitFor([&] { return events_.size() >= count; });
    }

    std::mutex mutex_;
    std::vector<Event> events_;
    std::vector<int32_t> lost_;
    std::vector<Refusal> refusals_;
    std::vector<Resumed> resumed_;
    std::vector<std::string> gave_up_;
    std::vector<std::string> refused_settings_;

  private:
    void Add(const std::function<void()>& change) {
        {
            std::lock_guard<std::mutex> lock(mutex_);
            change();
        }
        changed_.notify_all();
    }
    std::condition_variable changed_;
};

class SensorClientTest : public ::testing::Test {
  protected:
    void SetUp() override {
        registry_ = dir_.Path("binder");
        ASSERT_EQ(0, mkdir(registry_.c_str(), 0700));
        setenv("VYR_BINDER_DIR", registry_.c_str(), 1);
        ABinderProcess_startThreadPool();
    }

    // Starts the stand-in service and waits until it is registered: by default one of interface
    // version 1, to which the client enables every handle the version 1 way.
    std::unique_ptr<ChildProcess> StartFake(std::vector<std::string> args = {},
                                            const char* binary = FAKE_SERVICE_PATH) {
        args.insert(args.begin(), binary);
        auto fake = std::make_unique<ChildProcess>(
            args, std::map<std::string, std::string>{{"VYR_BINDER_DIR", registry_}},
            dir_.Path("fake-" + std::to_string(++fakes_) + ".log"));
        EXPECT_TRUE(fake->ReadLineStartingWith("registered", kWait)) << "the stand-in never ran";
        return fake;
    }
    static void Kill(ChildProcess* fake) {
        fake->Signal(SIGKILL);
        EXPECT_TRUE(fake->Wait(kWait));
    }
    static std::shared_ptr<IVYRService> Service() {
        // StartFake waited for the registration.
        ndk::SpAIBinder binder(AServiceManager_checkService(SensorClient::kServiceName));
        return IVYRService::fromBinder(binder);
    }
    // The stand-in's next call lines are exactly `calls`.
    static void ExpectCalls(ChildProcess* fake, const std::vector<std::string>& calls) {
        for (const std::string& call : calls) {
            std::optional<std::string> line = fake->ReadLine(kWait);
            ASSERT_TRUE(line) << "no call where " << call << " was expected";
            EXPECT_EQ(*line, call);
        }
    }
    static std::vector<std::string> AttachCalls(int32_t handle) {
        const std::string h = std::to_string(handle);
        return {"Open 3 -> " + h, "SetCallback " + h + " -> 0", "EnableLowPower " + h + " 1 -> -22",
                "ConfigureParameters " + h + " 30 20 5 10 1 0 1 2 40 4000 16 -> 0",
                "Enable " + h + " 20 -> 0"};
    }
    static vyr::SensorSettings RangeSettings() {
        vyr::SensorSettings settings;
        settings.mode = 3;
        settings.period_ms = 20;
        settings.use_callback = true;
        settings.low_power = true;
        settings.control_values = kControlValues;
        return settings;
    }
    static vyr::ReattachPolicy QuickPolicy() {
        vyr::ReattachPolicy policy;
        policy.first_delay = milliseconds(10);
        policy.max_delay = milliseconds(40);
        policy.max_refusals = 5;
        return policy;
    }
    static bool ClientThreadLeft() {
        return vyr_test::ThreadNames().find("vyrclient") != std::string::npos;
    }

    TempDir dir_;
    std::string registry_;
    int fakes_ = 0;
    Recorder recorder_;
};

TEST_F(SensorClientTest, AttachesWithEverySettingAndReceivesEvents) {
    auto fake = StartFake({"--first-handle", "7"});
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    EXPECT_EQ(client.handle(), 7);
    EXPECT_EQ(client.state(), SensorClient::State::kAttached);
    ExpectCalls(fake.get(), AttachCalls(7));
    EXPECT_TRUE(recorder_.WaitForEvents(3));
    EXPECT_EQ(recorder_.refused_settings_, std::vector<std::string>{"low power -22"});
    client.Stop();
    ExpectCalls(fake.get(), {"Disable 7", "Close 7"});
    EXPECT_EQ(client.state(), SensorClient::State::kStopped);
    EXPECT_FALSE(ClientThreadLeft()) << vyr_test::ThreadNames();
}

TEST_F(SensorClientTest, OnAVersion2ServiceACallbackClientIsEnabledOnSample) {
    auto fake = StartFake({"--first-handle", "7"}, FAKE_SERVICE_V2_PATH);
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    std::vector<std::string> calls = AttachCalls(7);
    calls.back() = "EnableOnSample 7 20 0 -> 0";
    ExpectCalls(fake.get(), calls);
    ASSERT_TRUE(recorder_.WaitForEvents(1));
    {
        std::lock_guard<std::mutex> lock(recorder_.mutex_);
        EXPECT_EQ(recorder_.events_[0].boottime, recorder_.events_[0].timestamp * 1000000)
            << "the reading's boot time reaches the listener";
    }
    client.Stop();
    ExpectCalls(fake.get(), {"Disable 7", "Close 7"});
}

TEST_F(SensorClientTest, InterfaceVersion1IsKeptWhenAsked) {
    auto fake = StartFake({"--first-handle", "7"}, FAKE_SERVICE_V2_PATH);
    vyr::SensorSettings settings = RangeSettings();
    settings.max_interface_version = 1;
    SensorClient client(settings, &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    ExpectCalls(fake.get(), AttachCalls(7));
    EXPECT_TRUE(recorder_.WaitForEvents(1));
    client.Stop();
    ExpectCalls(fake.get(), {"Disable 7", "Close 7"});
}

TEST_F(SensorClientTest, PollingClientIsEnabledTheVersion1WayOnAVersion2Service) {
    auto fake = StartFake({"--first-handle", "7"}, FAKE_SERVICE_V2_PATH);
    vyr::SensorSettings settings = RangeSettings();
    settings.use_callback = false;
    settings.low_power.reset();
    settings.control_values.clear();
    SensorClient client(settings, &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    ExpectCalls(fake.get(), {"Open 3 -> 7", "Enable 7 20 -> 0"});
    client.Stop();
    ExpectCalls(fake.get(), {"Disable 7", "Close 7"});
}

TEST_F(SensorClientTest, ReattachesAfterARestartWithEverySetting) {
    auto fake = StartFake({"--first-handle", "7"});
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    ExpectCalls(fake.get(), AttachCalls(7));
    ASSERT_TRUE(recorder_.WaitForEvents(1));

    Kill(fake.get());
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.lost_.empty(); }));
    EXPECT_EQ(recorder_.lost_, std::vector<int32_t>{7});
    EXPECT_EQ(client.state(), SensorClient::State::kReattaching);
    const size_t before = recorder_.EventCount();
    auto restarted = StartFake({"--first-handle", "100"});
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.resumed_.empty(); }));
    EXPECT_EQ(recorder_.resumed_[0].old_handle, 7);
    EXPECT_EQ(recorder_.resumed_[0].new_handle, 100);
    EXPECT_EQ(client.handle(), 100);
    ExpectCalls(restarted.get(), AttachCalls(100));
    EXPECT_TRUE(recorder_.WaitForEvents(before + 3)) << "events of the new instance";
    EXPECT_EQ(recorder_.refused_settings_.size(), 2u) << "low power refused by each instance";
    client.Stop();
    ExpectCalls(restarted.get(), {"Disable 100", "Close 100"});
}

TEST_F(SensorClientTest, RefusedOpensAreTriedAgainWithAGrowingDelay) {
    auto fake = StartFake({"--first-handle", "7"});
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    Kill(fake.get());
    auto restarted = StartFake({"--first-handle", "100", "--refuse", "3"});
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.resumed_.empty(); }));
    ASSERT_EQ(recorder_.refusals_.size(), 3u);
    const milliseconds delays[] = {milliseconds(10), milliseconds(20), milliseconds(40)};
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(recorder_.refusals_[i].result, -1);
        EXPECT_EQ(recorder_.refusals_[i].attempt, i + 1);
        EXPECT_EQ(recorder_.refusals_[i].retry_in, delays[i]);
    }
    ExpectCalls(restarted.get(), {"Open 3 -> -1", "Open 3 -> -1", "Open 3 -> -1"});
    ExpectCalls(restarted.get(), AttachCalls(100));
}

TEST_F(SensorClientTest, GivesUpAfterTheLimitOfRefusals) {
    auto fake = StartFake();
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    Kill(fake.get());
    auto absent = StartFake({"--absent"});
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.gave_up_.empty(); }));
    EXPECT_EQ(recorder_.gave_up_[0], "open refused 5 times, last with -19");
    EXPECT_EQ(recorder_.refusals_.size(), 4u);
    EXPECT_EQ(client.state(), SensorClient::State::kGaveUp);
    EXPECT_EQ(client.handle(), 0);
    Event event{};
    EXPECT_EQ(client.Poll(&event), SensorClient::kNotAttached);
    ExpectCalls(absent.get(), std::vector<std::string>(5, "Open 3 -> -19"));
    client.Stop();
    EXPECT_FALSE(ClientThreadLeft());
}

TEST_F(SensorClientTest, StopWhileWaitingForTheServiceEndsEverything) {
    auto fake = StartFake();
    {
        SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
        ASSERT_EQ(client.Start(Service()), 0);
        Kill(fake.get());
        ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.lost_.empty(); }));
        // Destroyed while it waits for a registration that never comes.
    }
    EXPECT_FALSE(ClientThreadLeft()) << vyr_test::ThreadNames();
}

TEST_F(SensorClientTest, StopDuringTheRefusalDelayClosesNothingAndEndsEverything) {
    auto fake = StartFake();
    vyr::ReattachPolicy policy = QuickPolicy();
    policy.first_delay = milliseconds(60000);
    SensorClient client(RangeSettings(), &recorder_, policy);
    ASSERT_EQ(client.Start(Service()), 0);
    Kill(fake.get());
    auto full = StartFake({"--first-handle", "50", "--refuse", "1"});
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.refusals_.empty(); }));
    client.Stop();
    EXPECT_EQ(client.state(), SensorClient::State::kStopped);
    EXPECT_FALSE(ClientThreadLeft());
    // The stand-in saw the refused Open alone: nothing was left open in it.
    ExpectCalls(full.get(), {"Open 3 -> -1"});
    full->CloseStdin();
    Kill(full.get());
    EXPECT_EQ(full->ReadLine(milliseconds(0)), std::nullopt);
}

TEST_F(SensorClientTest, StopRightAfterARestartClosesTheNewHandle) {
    auto fake = StartFake({"--first-handle", "7"});
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    Kill(fake.get());
    auto restarted = StartFake({"--first-handle", "100"});
    // Stopped at whatever step of the re-attach it has reached.
    client.Stop();
    std::vector<std::string> calls;
    while (std::optional<std::string> line = restarted->ReadLine(milliseconds(300))) {
        calls.push_back(*line);
    }
    const bool opened = !calls.empty() && calls[0] == "Open 3 -> 100";
    if (opened) {
        EXPECT_EQ(calls.back(), "Close 100") << "the new handle was left open";
    }
    EXPECT_FALSE(ClientThreadLeft());
}

TEST_F(SensorClientTest, PollingClientGetsNotAttachedWhileTheServiceIsAway) {
    auto fake = StartFake({"--first-handle", "7"});
    vyr::SensorSettings settings;
    settings.mode = 1;
    settings.period_ms = 20;
    settings.use_callback = false;
    SensorClient client(settings, &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    ExpectCalls(fake.get(), {"Open 1 -> 7", "Enable 7 20 -> 0"});
    Event event{};
    EXPECT_EQ(client.Poll(&event), 0);
    ExpectCalls(fake.get(), {"PollOnce 7 -> 0"});
    Kill(fake.get());
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.lost_.empty(); }));
    EXPECT_EQ(client.Poll(&event), SensorClient::kNotAttached);
    auto restarted = StartFake({"--first-handle", "9"});
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.resumed_.empty(); }));
    EXPECT_EQ(client.Poll(&event), 0);
    ExpectCalls(restarted.get(), {"Open 1 -> 9", "Enable 9 20 -> 0", "PollOnce 9 -> 0"});
}

TEST_F(SensorClientTest, WithoutReattachALostServiceIsOnlyReported) {
    auto fake = StartFake();
    vyr::ReattachPolicy policy = QuickPolicy();
    policy.reattach = false;
    SensorClient client(RangeSettings(), &recorder_, policy);
    ASSERT_EQ(client.Start(Service()), 0);
    Kill(fake.get());
    ASSERT_TRUE(recorder_.WaitFor([&] { return !recorder_.lost_.empty(); }));
    EXPECT_EQ(client.state(), SensorClient::State::kLost);
    EXPECT_TRUE(recorder_.resumed_.empty());
}

TEST_F(SensorClientTest, AFailedStartLeavesNothingOpenAndMayBeTriedAgain) {
    auto fake = StartFake({"--refuse", "1"});
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    EXPECT_EQ(client.Start(Service()), -1);
    EXPECT_EQ(client.state(), SensorClient::State::kIdle);
    EXPECT_EQ(client.Start(nullptr), SensorClient::kNotAttached);
    ASSERT_EQ(client.Start(Service()), 0);
    EXPECT_EQ(client.Start(Service()), -EALREADY);
    ExpectCalls(fake.get(), {"Open 3 -> -1"});
    ExpectCalls(fake.get(), AttachCalls(1));
}

// A binder of this process cannot be linked to: the runtime reports the link gone inside the
// failed call, and the cookie is freed there once (AddressSanitizer tells a second free).
TEST_F(SensorClientTest, AServiceThatCannotBeLinkedIsRefusedWithoutADoubleFree) {
    auto local = ndk::SharedRefBase::make<vyr_test::binder::TestService>();
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    EXPECT_EQ(client.Start(local), SensorClient::kNotAttached);
    EXPECT_EQ(client.state(), SensorClient::State::kIdle);
    EXPECT_EQ(client.Start(local), SensorClient::kNotAttached);
}

// Without a pool no notice would ever reach the client: Start says so instead of attaching.
TEST_F(SensorClientTest, StartWithoutABinderThreadPoolIsRefused) {
    auto fake = StartFake();
    // The runtime starts afresh, with no pool, on the next call.
    VyrBinder_shutdown();
    std::shared_ptr<IVYRService> service = Service();
    ASSERT_NE(service, nullptr);
    ASSERT_FALSE(ABinderProcess_isThreadPoolStarted());
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    EXPECT_EQ(client.Start(service), SensorClient::kNoThreadPool);
    EXPECT_EQ(client.state(), SensorClient::State::kIdle);
    ABinderProcess_startThreadPool();
    ASSERT_EQ(client.Start(service), 0);
    ExpectCalls(fake.get(), AttachCalls(1));
}

// Each registration notice hands over its own reference: after ten restarts the client holds
// the proxy of the instance it is attached to, and nothing else.
TEST_F(SensorClientTest, TenRestartsLeaveOneProxyAlive) {
    auto fake = StartFake();
    SensorClient client(RangeSettings(), &recorder_, QuickPolicy());
    ASSERT_EQ(client.Start(Service()), 0);
    for (int restart = 1; restart <= 10; ++restart) {
        Kill(fake.get());
        fake = StartFake();
        ASSERT_TRUE(recorder_.WaitFor([&] {
            return recorder_.resumed_.size() == static_cast<size_t>(restart);
        })) << "restart "
            << restart;
    }
    // The service's binder, and the callback's proxies that the dead instances held are gone
    // with them.
    const auto deadline = std::chrono::steady_clock::now() + kWait;
    while (VyrBinder_liveProxyCount() != 1 && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(milliseconds(10));
    }
    EXPECT_EQ(VyrBinder_liveProxyCount(), 1);
    client.Stop();
}

// vyrctl stream on the real service, across a restart of it.
class StreamAcrossRestartTest : public ::testing::Test {
  protected:
    static std::string ReadAll(const std::string& path) {
        std::ifstream in(path);
        std::stringstream text;
        text << in.rdbuf();
        return text.str();
    }
    static bool WaitForText(const std::string& path, const std::string& text) {
        const auto deadline = std::chrono::steady_clock::now() + kRegistration;
        while (ReadAll(path).find(text) == std::string::npos) {
            if (std::chrono::steady_clock::now() >= deadline) return false;
            std::this_thread::sleep_for(milliseconds(20));
        }
        return true;
    }
    std::unique_ptr<ChildProcess> Stream(const std::vector<std::string>& extra) {
        std::vector<std::string> args = {VYRCTL_PATH,  "stream",   "range",
                                         "--callback", "--period", "100"};
        args.insert(args.end(), extra.begin(), extra.end());
        return std::make_unique<ChildProcess>(args, service_.ClientEnvironment(), stderr_path_);
    }

    vyr_test::ServiceProcess service_;
    std::string stderr_path_ = service_.dir() + "/vyrctl.err";
};

TEST_F(StreamAcrossRestartTest, StreamGoesOnAndSaysSo) {
    ASSERT_TRUE(service_.Start(VYRSERVICE_PATH));
    ASSERT_NE(service_.WaitForService(kRegistration), nullptr) << service_.Log();
    auto stream = Stream({});
    ASSERT_TRUE(stream->ReadLine(kWait)) << ReadAll(stderr_path_);
    service_.Stop();
    ASSERT_TRUE(WaitForText(stderr_path_, "service lost (handle ")) << ReadAll(stderr_path_);
    ASSERT_TRUE(service_.Start(VYRSERVICE_PATH));
    ASSERT_TRUE(WaitForText(stderr_path_, "service restarted: handle ")) << ReadAll(stderr_path_);
    // Events of the new instance.
    std::optional<std::string> line;
    while ((line = stream->ReadLine(milliseconds(0)))) {
    }
    EXPECT_TRUE(stream->ReadLine(kWait)) << "no event after the restart";
    EXPECT_TRUE(stream->Running());
    stream->Signal(SIGINT);
    const std::optional<int> status = stream->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 0) << ReadAll(stderr_path_);
}

TEST_F(StreamAcrossRestartTest, NoReconnectEndsWithAnError) {
    ASSERT_TRUE(service_.Start(VYRSERVICE_PATH));
    ASSERT_NE(service_.WaitForService(kRegistration), nullptr) << service_.Log();
    auto stream = Stream({"--no-reconnect"});
    ASSERT_TRUE(stream->ReadLine(kWait)) << ReadAll(stderr_path_);
    service_.Stop();
    const std::optional<int> status = stream->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 1);
    EXPECT_NE(ReadAll(stderr_path_).find("error: vyrservice died"), std::string::npos);
}

}  // namespace
}  // namespace vyr_test::client
