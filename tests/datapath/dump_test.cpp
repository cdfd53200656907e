// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service's dump: its content follows the service's state, its JSON form carries the same
// values as its text, and it never waits long for a busy service.

#include <aidl/android/vyr/Event.h>
#include <android/log.h>

#include <chrono>
#include <future>
#include <nlohmann/json.hpp>
#include <string>
#include <thread>

#include "data_path_fixture.h"
#include "service_dump.h"

namespace vyr_test::datapath {
namespace {

using nlohmann::json;

constexpr size_t kRangeBlock = 2;

MultiRangingData Frame(uint32_t time_ms, uint8_t valid = 1) {
    MultiRangingData data{};
    data.time_ms = time_ms;
    data.valid = valid;
    return data;
}

class DumpTest : public DataPathTest {
  protected:
    std::string Text() {
        vyr_test::DumpResult dump = vyr_test::DumpOf(service_->asBinder().get());
        EXPECT_EQ(dump.status, STATUS_OK);
        return dump.text;
    }
    json Json() {
        vyr_test::DumpResult dump = vyr_test::DumpOf(service_->asBinder().get(), {"--json"});
        EXPECT_EQ(dump.status, STATUS_OK);
        return json::parse(dump.text);
    }
    static json ClientOf(const json& dump, int32_t handle) {
        for (const json& client : dump["clients"]) {
            if (client["handle"] == handle) return client;
        }
        return json();
    }
    // Waits until the range worker has applied `count` items in all.
    void WaitForRangeItems(uint64_t count) {
        const auto deadline = std::chrono::steady_clock::now() + kWait;
        while (Json()["work_queues"][1]["applied"] != count) {
            ASSERT_LT(std::chrono::steady_clock::now(), deadline) << "range worker items";
            std::this_thread::sleep_for(std::chrono::milliseconds(2));
        }
    }
    static bool HasEvent(const json& dump, const std::string& text) {
        for (const json& event : dump["events"]) {
            if (event["event"] == text) return true;
        }
        return false;
    }
};

TEST_F(DumpTest, FollowsOpenEnableAtTwoPeriodsAndDisable) {
    const int32_t first = Open(kRange);
    const int32_t second = Open(kRange);
    for (int32_t handle : {first, second}) EXPECT_GT(handle, 0);
    json dump = Json();
    EXPECT_EQ(dump["api_lock"], "taken");
    EXPECT_EQ(ClientOf(dump, first)["state"], "disabled");
    EXPECT_TRUE(HasEvent(dump, "open handle " + std::to_string(first) + " mode 3"));

    EXPECT_EQ(0, Enable(first, 200));
    EXPECT_EQ(0, Enable(second, 100));
    WaitForRangeItems(2);
    dump = Json();
    const json& block = dump["modes"][kRangeBlock];
    EXPECT_EQ(block["mode"], kRange);
    EXPECT_EQ(block["enable_count"], 2);
    EXPECT_EQ(block["running"], true);
    EXPECT_EQ(block["active_period_ms"], 100);
    EXPECT_EQ(block["periods_ms"][std::to_string(first)], 200);
    EXPECT_EQ(block["periods_ms"][std::to_string(second)], 100);
    EXPECT_EQ(ClientOf(dump, first)["state"], "enabled");
    EXPECT_EQ(ClientOf(dump, first)["period_ms"], 200);
    EXPECT_EQ(ClientOf(dump, second)["period_ms"], 100);
    EXPECT_EQ(ClientOf(dump, second)["callback"], false);
    EXPECT_EQ(ClientOf(dump, second)["pid"], nullptr) << "opened from the service's own process";
    EXPECT_EQ(dump["sensors"]["range"]["enabled"], true);
    EXPECT_EQ(dump["work_queues"][1]["applied"], 2);
    EXPECT_TRUE(HasEvent(dump, "enable handle " + std::to_string(first) + " period 200"));

    Disable(second);
    WaitForRangeItems(3);
    dump = Json();
    EXPECT_EQ(dump["modes"][kRangeBlock]["active_period_ms"], 200);
    EXPECT_EQ(dump["modes"][kRangeBlock]["enable_count"], 1);
    EXPECT_FALSE(dump["modes"][kRangeBlock]["periods_ms"].contains(std::to_string(second)));
    EXPECT_EQ(ClientOf(dump, second)["state"], "disabled");
    EXPECT_TRUE(HasEvent(dump, "disable handle " + std::to_string(second)));
}

TEST_F(DumpTest, TextShowsTheSameValuesAsJson) {
    const int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    EXPECT_EQ(0, Enable(handle, 150));
    WaitForRangeItems(1);
    const json dump = Json();
    const std::string text = Text();
    EXPECT_EQ(text.rfind("api_lock: taken\n", 0), 0u) << text;
    EXPECT_NE(text.find("active_period_ms: " +
                        dump["modes"][kRangeBlock]["active_period_ms"].dump() + "\n"),
              std::string::npos)
        << text;
    EXPECT_NE(text.find("handle: " + std::to_string(handle) + "\n"), std::string::npos) << text;
    EXPECT_NE(text.find(std::to_string(handle) + ": 150\n"), std::string::npos) << text;
    EXPECT_NE(text.find("event: enable handle " + std::to_string(handle) + " period 150\n"),
              std::string::npos)
        << text;
    EXPECT_EQ(dump["events"].size(), 2u);
}

TEST_F(DumpTest, CountsSamplesInvalidSamplesRefusedPollsAndDeliveries) {
    const int32_t poller = Open(kRange);
    const int32_t pushed = Open(kRange);
    for (int32_t handle : {poller, pushed}) EXPECT_GT(handle, 0);
    auto callback = NewCallback();
    int32_t result = 1;
    ASSERT_TRUE(service_->SetCallback(pushed, callback, &result).isOk());
    sensor_doubles::SetRangeData(Frame(1, 0));
    StartHeldSampling(poller, kRange);
    aidl::android::vyr::Event event;
    EXPECT_EQ(Poll(poller, &event), -61) << "invalid";
    EXPECT_EQ(Poll(poller, &event), -61) << "already taken";
    sensor_doubles::SetRangeData(Frame(2));
    EXPECT_EQ(0, Enable(pushed, 1));
    // Valid samples, one at a time, until the callback has had one.
    int published = 1;
    while (published < 50 && callback->Count() == 0) {
        PublishNextSample();
        ++published;
        callback->WaitForEvents(1, std::chrono::milliseconds(100));
    }
    ASSERT_EQ(callback->Count(), 1u);

    // The delivery is counted once OnEvent has returned.
    const auto deadline = std::chrono::steady_clock::now() + kWait;
    json dump = Json();
    while (ClientOf(dump, pushed)["events_delivered"] != 1 &&
           std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
        dump = Json();
    }
    const json& block = dump["modes"][kRangeBlock];
    // At least: a read may slip through between a release and the next hold.
    EXPECT_GE(block["samples"].get<int>(), published);
    EXPECT_GE(block["invalid_samples"].get<int>(), 1);
    EXPECT_LT(block["invalid_samples"].get<int>(), block["samples"].get<int>());
    EXPECT_TRUE(block["last_sample_age_ms"].is_number());
    EXPECT_EQ(ClientOf(dump, poller)["polls_refused"], 2);
    EXPECT_EQ(ClientOf(dump, pushed)["callback"], true);
    EXPECT_EQ(ClientOf(dump, pushed)["events_delivered"], 1);
}

TEST_F(DumpTest, ShowsWhyTheLightSensorIsAbsentAndTheTorchState) {
    json dump = Json();
    EXPECT_EQ(dump["sensors"]["light"]["state"], "present");
    EXPECT_EQ(dump["sensors"]["light"]["torch"], nullptr);
    service_->SetTorchLightState(7);
    EXPECT_EQ(Json()["sensors"]["light"]["torch"], 7);
    EXPECT_EQ(dump["display"]["last_state"], nullptr);
    EXPECT_EQ(dump["apex"], "no listener");

    MakeService(false);
    dump = Json();
    EXPECT_EQ(dump["sensors"]["light"]["state"],
              "absent: persist.vendor.camera.vyr_supported is off");
    EXPECT_EQ(dump["display"]["monitor"], "not started");
}

TEST_F(DumpTest, BusyApiLockIsReportedFirstAndTheDumpDoesNotWaitForIt) {
    const int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    auto callback = NewCallback();
    int32_t result = 1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    // The callback blocks until the test lets it go; a Disable then holds the API lock while it
    // waits for the notification thread.
    std::promise<void> release;
    std::shared_future<void> released = release.get_future().share();
    callback->SetReaction([released](size_t count) {
        if (count == 1) released.wait();
    });
    sensor_doubles::SetRangeData(Frame(1));
    EXPECT_EQ(0, Enable(handle, 1));
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));
    std::thread disabler([this, handle] { service_->Disable(handle); });
    ASSERT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO,
                             "DisableInternal handle " + std::to_string(handle) + ", mode 3",
                             kWait));

    std::future<vyr_test::DumpResult> dump = std::async(
        std::launch::async, [this] { return vyr_test::DumpOf(service_->asBinder().get()); });
    // It returns while the API lock is still held: the callback has not been let go.
    const bool returned = dump.wait_for(kWait) == std::future_status::ready;
    release.set_value();
    disabler.join();
    ASSERT_TRUE(returned) << "the dump waited for the API lock";
    const std::string text = dump.get().text;
    EXPECT_EQ(text.rfind("api_lock: busy for 1000 ms", 0), 0u) << text;
    EXPECT_NE(text.find("clients: -\n"), std::string::npos) << text;
    EXPECT_NE(text.find("active_period_ms: 1\n"), std::string::npos) << "the rest is shown";
    WaitForIdleWorkers();
}

}  // namespace
}  // namespace vyr_test::datapath
