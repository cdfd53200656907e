// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// A recording replayed through the real service: the simulator's scene recorded at 100 ms with
// vyrctl stream --json, replayed (range.replay, als.replay) and recorded again gives the same
// events in the same order, and a looping replay starts over with the same events.

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "child_process.h"
#include "service_process.h"

namespace vyr_test::datapath {
namespace {

using nlohmann::json;
using std::chrono::milliseconds;

// The service waits 4 s before it registers; sanitizer builds start slower still.
constexpr milliseconds kRegistration{30000};
constexpr milliseconds kWait{20000};

class ReplayRoundTripTest : public ::testing::Test {
  protected:
    void TearDown() override { unsetenv("VYR_SENSOR_SCENARIO"); }

    // Starts a recording of `count` events of `sensor` at 100 ms from `service`.
    std::unique_ptr<ChildProcess> Record(const ServiceProcess& service, const std::string& sensor,
                                         int count) {
        return std::make_unique<ChildProcess>(
            std::vector<std::string>{VYRCTL_PATH, "stream", sensor, "--callback", "--period", "100",
                                     "--json", "--count", std::to_string(count)},
            service.ClientEnvironment(), service.dir() + "/" + sensor + ".err");
    }
    // The recording's lines, once it has ended.
    static std::vector<std::string> Lines(ChildProcess* recording) {
        std::vector<std::string> lines;
        while (std::optional<std::string> line = recording->ReadLine(kWait)) lines.push_back(*line);
        const std::optional<int> status = recording->Wait(kWait);
        EXPECT_TRUE(status && WIFEXITED(*status) && WEXITSTATUS(*status) == 0);
        return lines;
    }
    static std::string Write(const std::string& path, const std::vector<std::string>& lines) {
        std::ofstream out(path, std::ios::trunc);
        for (const std::string& line : lines) out << line << "\n";
        return path;
    }
    // Each event without its handle and boot times, which differ between runs by design.
    static std::vector<json> Events(const std::vector<std::string>& lines) {
        std::vector<json> events;
        for (const std::string& line : lines) {
            json event = json::parse(line);
            event.erase("handle");
            event.erase("boottime_ns");
            event.erase("received_boottime_ns");
            events.push_back(event);
        }
        return events;
    }
    // Whether `replayed` is `recorded` with at most some events left out: none invented, none
    // out of order.
    static bool IsSubsequence(const std::vector<json>& replayed, const std::vector<json>& recorded) {
        size_t at = 0;
        for (const json& event : replayed) {
            while (at < recorded.size() && recorded[at] != event) ++at;
            if (at == recorded.size()) return false;
            ++at;
        }
        return true;
    }
};

TEST_F(ReplayRoundTripTest, ReplayedEventsAreTheRecordedOnesInOrderAlsoAcrossALoop) {
    std::vector<std::string> range_lines;
    std::vector<std::string> light_lines;
    {
        ServiceProcess original;
        ASSERT_TRUE(original.Start(VYRSERVICE_PATH));
        ASSERT_NE(original.WaitForService(kRegistration), nullptr) << original.Log();
        auto range = Record(original, "range", 30);
        auto light = Record(original, "als", 8);
        range_lines = Lines(range.get());
        light_lines = Lines(light.get());
    }
    ASSERT_EQ(range_lines.size(), 30u);
    ASSERT_EQ(light_lines.size(), 8u);

    ServiceProcess replaying;
    const std::string scenario = replaying.dir() + "/scenario";
    std::ofstream(scenario) << "range.replay="
                            << Write(replaying.dir() + "/range.jsonl", range_lines)
                            << "\nals.replay=" << Write(replaying.dir() + "/als.jsonl", light_lines)
                            << "\nals.replay.loop=1\n";
    setenv("VYR_SENSOR_SCENARIO", scenario.c_str(), 1);
    ASSERT_TRUE(replaying.Start(VYRSERVICE_PATH));
    ASSERT_NE(replaying.WaitForService(kRegistration), nullptr) << replaying.Log();
    auto range = Record(replaying, "range", 20);
    auto light = Record(replaying, "als", 20);
    const std::vector<json> range_again = Events(Lines(range.get()));
    const std::vector<json> light_again = Events(Lines(light.get()));

    ASSERT_EQ(range_again.size(), 20u);
    EXPECT_TRUE(IsSubsequence(range_again, Events(range_lines))) << "replayed:\n"
                                                                 << json(range_again).dump(1);
    // Twenty events from eight records: the replay went round more than twice.
    ASSERT_EQ(light_again.size(), 20u);
    std::vector<json> looped;
    for (int pass = 0; pass < 4; ++pass) {
        for (const json& event : Events(light_lines)) looped.push_back(event);
    }
    EXPECT_TRUE(IsSubsequence(light_again, looped)) << "replayed:\n" << json(light_again).dump(1);
    EXPECT_NE(replaying.Log().find("range sensor: replaying 30 records of"), std::string::npos)
        << replaying.Log();
}

TEST_F(ReplayRoundTripTest, ABadRecordingLeavesTheSensorAbsentAndTheServiceServing) {
    ServiceProcess service;
    const std::string recording = service.dir() + "/broken.jsonl";
    std::ofstream(recording) << "{\"sensor\":\"range\",\"timestamp\":0,\"data\":[1]}\n";
    const std::string scenario = service.dir() + "/scenario";
    std::ofstream(scenario) << "range.replay=" << recording << "\n";
    setenv("VYR_SENSOR_SCENARIO", scenario.c_str(), 1);
    ASSERT_TRUE(service.Start(VYRSERVICE_PATH));
    auto binder = service.WaitForService(kRegistration);
    ASSERT_NE(binder, nullptr) << service.Log();
    int32_t result = 0;
    ASSERT_TRUE(binder->Open(3, &result).isOk());
    EXPECT_EQ(result, -19);
    EXPECT_NE(service.Log().find(recording + ":1: \"data\" needs the 10 header values"),
              std::string::npos)
        << service.Log();
    EXPECT_TRUE(service.Running());
}

}  // namespace
}  // namespace vyr_test::datapath
