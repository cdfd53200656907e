// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_dump_state.h"

#include <gtest/gtest.h>

#include <memory>
#include <mutex>
#include <nlohmann/json.hpp>
#include <string>
#include <unordered_map>

namespace vyr_test::service {
namespace {

using android::vyr::binder::ClientEntry;
using android::vyr::binder::DumpValue;
using android::vyr::binder::kClientEnabled;
using android::vyr::binder::SampleRing;
using android::vyr::binder::ServiceDumpState;
using android::vyr::binder::ServiceModeParams;
using android::vyr::binder::WorkItem;
using android::vyr::binder::WorkQueue;
using nlohmann::json;

json Json(const DumpValue& value) {
    return json::parse(value.ToJson());
}

TEST(ServiceDumpStateTest, SensorsShowPresenceTorchAndPower) {
    ServiceDumpState state;
    state.SetPresence("present", "absent: Create() failed");
    json sensors = Json(state.Sensors(/*light_enabled=*/true, /*low_power=*/false));
    EXPECT_EQ(sensors["light"]["state"], "present");
    EXPECT_EQ(sensors["light"]["enabled"], true);
    EXPECT_TRUE(sensors["light"]["torch"].is_null()) << "no torch state passed on yet";
    EXPECT_EQ(sensors["light"]["low_power"], false);
    EXPECT_EQ(sensors["range"]["state"], "absent: Create() failed");
    EXPECT_EQ(sensors["range"]["initialized"], false);

    state.NoteTorch(2);
    state.NoteRangeInitialized(true);
    state.NoteRangeEnabled(true);
    sensors = Json(state.Sensors(false, true));
    EXPECT_EQ(sensors["light"]["torch"], 2);
    EXPECT_EQ(sensors["light"]["low_power"], true);
    EXPECT_EQ(sensors["range"]["initialized"], true);
    EXPECT_EQ(sensors["range"]["enabled"], true);
}

TEST(ServiceDumpStateTest, TheDisplayKeepsItsLastReadStateAcrossAStatusChange) {
    ServiceDumpState state;
    json display = Json(state.Display());
    EXPECT_EQ(display["monitor"], "not started");
    EXPECT_TRUE(display["last_state"].is_null());

    state.NoteDisplay("watching /x", "On");
    state.NoteDisplay("watching /x", "");
    display = Json(state.Display());
    EXPECT_EQ(display["monitor"], "watching /x");
    EXPECT_EQ(display["last_state"], "") << "once read, an empty read is shown as read";
    EXPECT_GE(display["last_read_age_ms"].get<int64_t>(), 0);
}

TEST(ServiceDumpStateTest, EventsAndTheApexSectionAreShownAsGiven) {
    ServiceDumpState state;
    EXPECT_EQ(Json(state.Apex()), "no listener");
    state.SetApexSection([] { return DumpValue("apex ok"); });
    EXPECT_EQ(Json(state.Apex()), "apex ok");

    state.RecordEvent("open handle 5 mode 1");
    state.RecordEvent("close handle 5");
    const json events = Json(state.Events());
    ASSERT_EQ(events.size(), 2u);
    EXPECT_EQ(events[0]["event"], "open handle 5 mode 1");
    EXPECT_EQ(events[1]["event"], "close handle 5");
    EXPECT_LE(events[0]["time_ms"].get<int64_t>(), events[1]["time_ms"].get<int64_t>());
}

TEST(ServiceDumpStateTest, AModeBlockNamesTheDisplayHandleAndCountsSamples) {
    ServiceModeParams params;
    params.mode = 1;
    params.active_period = 100;
    {
        std::lock_guard<std::mutex> lock(params.dump.mutex);
        params.dump.enable_count = 2;
        params.dump.periods = {{42, 100}, {-7, 1000}};
    }
    params.dump.samples = 5;
    params.dump.invalid_samples = 1;
    json block = Json(ServiceDumpState::ModeBlock(params, 0, /*display_handle=*/-7));
    EXPECT_EQ(block["block"], 0);
    EXPECT_EQ(block["mode"], 1);
    EXPECT_EQ(block["active_period_ms"], 100);
    EXPECT_EQ(block["enable_count"], 2);
    EXPECT_EQ(block["periods_ms"], (json{{"42", 100}, {"display", 1000}}));
    EXPECT_EQ(block["samples"], 5);
    EXPECT_EQ(block["invalid_samples"], 1);
    EXPECT_TRUE(block["last_sample_age_ms"].is_null()) << "nothing stored yet";
    EXPECT_EQ(block["ring_clients"], 0);
    EXPECT_TRUE(block["ring_last_seq"].is_null()) << "no ring made yet";
}

TEST(ServiceDumpStateTest, AModeBlockShowsItsRingsClientsAndLastRecord) {
    ServiceModeParams params;
    params.mode = 3;
    std::string error;
    std::shared_ptr<SampleRing> ring = SampleRing::Create(3, 8, &error);
    ASSERT_NE(ring, nullptr) << error;
    ring->Write(aidl::android::vyr::Event{});
    ring->Write(aidl::android::vyr::Event{});
    {
        std::lock_guard<std::mutex> lock(params.data_mutex);
        params.feed.ring = ring;
        params.feed.ring_clients = 2;
    }
    json block = Json(ServiceDumpState::ModeBlock(params, 1, /*display_handle=*/-7));
    EXPECT_EQ(block["ring_clients"], 2);
    EXPECT_EQ(block["ring_last_seq"], 2);
}

TEST(ServiceDumpStateTest, ClientsAreListedByHandleWithTheirUsersAndCounters) {
    std::unordered_map<int32_t, std::shared_ptr<ClientEntry>> clients;
    auto polled = std::make_shared<ClientEntry>(3);
    polled->period = 33;
    polled->users.opener_pid = 1234;
    polled->users.processes = {{1, 1234}, {2, 99}};
    polled->counters.polls_refused = 4;
    auto pushed = std::make_shared<ClientEntry>(1);
    pushed->state = kClientEnabled;
    pushed->users.unwatched = true;
    pushed->delivery.on_sample = true;
    pushed->delivery.ring = true;
    pushed->counters.events_delivered = 3;
    *pushed->counters.samples_dropped = 2;
    clients.emplace(20, polled);
    clients.emplace(10, pushed);

    const json shown = Json(ServiceDumpState::Clients(clients));
    ASSERT_EQ(shown.size(), 2u);
    EXPECT_EQ(shown[0]["handle"], 10);
    EXPECT_EQ(shown[0]["state"], "enabled");
    EXPECT_TRUE(shown[0]["pid"].is_null());
    EXPECT_EQ(shown[0]["unwatched_user"], true);
    EXPECT_EQ(shown[0]["on_sample"], true);
    EXPECT_EQ(shown[0]["events_delivered"], 3);
    EXPECT_EQ(shown[0]["samples_dropped"], 2);
    EXPECT_EQ(shown[0]["ring"], true);
    EXPECT_EQ(shown[1]["ring"], false);
    EXPECT_EQ(shown[1]["handle"], 20);
    EXPECT_EQ(shown[1]["mode"], 3);
    EXPECT_EQ(shown[1]["state"], "disabled");
    EXPECT_EQ(shown[1]["period_ms"], 33);
    EXPECT_EQ(shown[1]["pid"], 1234);
    EXPECT_EQ(shown[1]["processes"], (json{1234, 99}));
    EXPECT_EQ(shown[1]["polls_refused"], 4);
}

TEST(ServiceDumpStateTest, WorkQueuesShowDepthAndWhatWasApplied) {
    std::array<WorkQueue, 2> queues;
    queues[1].PushAndSignal(WorkItem{true, 3, 5, 100});
    queues[1].PushAndSignal(WorkItem{false, 3, 5, 0});
    queues[0].CountApplied();
    const json shown = Json(ServiceDumpState::WorkQueues(queues));
    ASSERT_EQ(shown.size(), 2u);
    EXPECT_EQ(shown[0]["sensor_type"], 0);
    EXPECT_EQ(shown[0]["applied"], 1);
    EXPECT_EQ(shown[1]["depth"], 2);
    EXPECT_EQ(shown[1]["highest_depth"], 2);
}

}  // namespace
}  // namespace vyr_test::service
