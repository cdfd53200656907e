// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensor_doubles.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <future>
#include <thread>

namespace sd = sensor_doubles;
using namespace std::chrono_literals;

namespace vyr_test::sensors {
namespace {

class SensorDoublesTest : public ::testing::Test {
  protected:
    void SetUp() override { sd::Reset(); }
    void TearDown() override {
        AmbientLightSensor::Destroy();
        ubk::RangeSensor::Destroy();
        sd::Reset();
    }
};

MultiRangingData RangeFrame(uint32_t time_ms) {
    MultiRangingData data{};
    data.time_ms = time_ms;
    data.zone_count = 2;
    data.valid = 1;
    data.zones[1].distance_mm = static_cast<int16_t>(time_ms);
    return data;
}

ALSResult AlsSample(float lux) {
    ALSResult data{};
    data.lux = lux;
    data.valid = 1;
    return data;
}

TEST_F(SensorDoublesTest, CreateReturnsOneInstanceAndIsRecorded) {
    AmbientLightSensor* als = AmbientLightSensor::Create();
    ASSERT_NE(als, nullptr);
    EXPECT_EQ(AmbientLightSensor::Create(), als);
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ASSERT_NE(range, nullptr);
    EXPECT_EQ(ubk::RangeSensor::Create(), range);
    EXPECT_EQ(sd::CountOf(sd::kAlsCreate), 2u);
    EXPECT_EQ(sd::CountOf(sd::kRangeCreate), 2u);
}

TEST_F(SensorDoublesTest, CreateFailsWhileSet) {
    sd::SetAlsCreateFails(true);
    sd::SetRangeCreateFails(true);
    EXPECT_EQ(AmbientLightSensor::Create(), nullptr);
    EXPECT_EQ(ubk::RangeSensor::Create(), nullptr);
    EXPECT_EQ(sd::CountOf(sd::kAlsCreate), 1u);
    EXPECT_EQ(sd::CountOf(sd::kRangeCreate), 1u);
    sd::SetAlsCreateFails(false);
    EXPECT_NE(AmbientLightSensor::Create(), nullptr);
    EXPECT_EQ(ubk::RangeSensor::Create(), nullptr);
}

TEST_F(SensorDoublesTest, ResetMakesCreateSucceedAgain) {
    sd::SetRangeCreateFails(true);
    sd::SetAlsCreateFails(true);
    sd::Reset();
    EXPECT_NE(ubk::RangeSensor::Create(), nullptr);
    EXPECT_NE(AmbientLightSensor::Create(), nullptr);
}

TEST_F(SensorDoublesTest, DestroyWithoutCreateIsRecorded) {
    AmbientLightSensor::Destroy();
    ubk::RangeSensor::Destroy();
    EXPECT_EQ(sd::CountOf(sd::kAlsDestroy), 1u);
    EXPECT_EQ(sd::CountOf(sd::kRangeDestroy), 1u);
}

TEST_F(SensorDoublesTest, RecordsNamesArgsAndOrder) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    AmbientLightSensor* als = AmbientLightSensor::Create();
    MultiRangingData data{};
    ALSResult result{};
    range->Init();
    range->Enable(true);
    range->Process(3, &data);
    range->Enable(false);
    range->Uninit();
    als->ReadSingleShot(&result, true, 30);
    als->ReadSingleShot(&result, false, 255);
    als->Disable();
    als->SetTorchLightState(static_cast<unsigned char>(257));

    const std::vector<sd::Call> calls = sd::Calls();
    ASSERT_EQ(calls.size(), 11u);
    const std::vector<std::pair<std::string, std::vector<int64_t>>> expected = {
        {sd::kRangeCreate, {}},
        {sd::kAlsCreate, {}},
        {sd::kRangeInit, {}},
        {sd::kRangeEnable, {1}},
        {sd::kRangeProcess, {3}},
        {sd::kRangeEnable, {0}},
        {sd::kRangeUninit, {}},
        {sd::kAlsReadSingleShot, {1, 30}},
        {sd::kAlsReadSingleShot, {0, 255}},
        {sd::kAlsDisable, {}},
        {sd::kAlsSetTorchLightState, {1}},
    };
    for (size_t i = 0; i < expected.size(); ++i) {
        EXPECT_EQ(calls[i].name, expected[i].first) << i;
        EXPECT_EQ(calls[i].args, expected[i].second) << i;
        EXPECT_EQ(calls[i].thread, std::this_thread::get_id()) << i;
        if (i > 0) {
            EXPECT_GE(calls[i].time, calls[i - 1].time) << i;
        }
    }
}

TEST_F(SensorDoublesTest, RecordsTheCallingThread) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    std::thread::id other;
    std::thread thread([&] {
        other = std::this_thread::get_id();
        range->Init();
    });
    thread.join();
    range->Uninit();
    ASSERT_EQ(sd::CountOf(sd::kRangeInit), 1u);
    EXPECT_EQ(sd::CallsNamed(sd::kRangeInit)[0].thread, other);
    EXPECT_EQ(sd::CallsNamed(sd::kRangeUninit)[0].thread, std::this_thread::get_id());
    EXPECT_NE(other, std::this_thread::get_id());
}

TEST_F(SensorDoublesTest, RecordsConfigureParametersSettings) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ControlSettings settings{};
    settings.frame_rate_hz = 15;
    settings.timing_budget_ms = -2;
    settings.signal_threshold = 3;
    settings.sigma_threshold_mm = 4;
    settings.smudge_correction = true;
    settings.crosstalk_correction = false;
    settings.ambient_correction = true;
    settings.distance_mode = 7;
    settings.range_min_mm = 8;
    settings.range_max_mm = 9;
    settings.zone_layout = 10;
    range->ConfigureParameters(settings);
    const std::vector<sd::Call> calls = sd::CallsNamed(sd::kRangeConfigureParameters);
    ASSERT_EQ(calls.size(), 1u);
    EXPECT_TRUE(calls[0].args.empty());
    EXPECT_EQ(memcmp(&calls[0].settings, &settings, sizeof(settings)), 0);
}

TEST_F(SensorDoublesTest, RecordsAlsEnabledAtCallTime) {
    AmbientLightSensor* als = AmbientLightSensor::Create();
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ALSResult result{};
    als->ReadSingleShot(&result, true, 30);
    als->enabled = true;
    als->ReadSingleShot(&result, true, 30);
    range->Init();
    als->enabled = false;
    als->Disable();
    const std::vector<sd::Call> calls = sd::Calls();
    ASSERT_EQ(calls.size(), 6u);
    EXPECT_FALSE(calls[2].als_enabled);
    EXPECT_TRUE(calls[3].als_enabled);
    EXPECT_TRUE(calls[4].als_enabled);
    EXPECT_FALSE(calls[5].als_enabled);
}

TEST_F(SensorDoublesTest, ResultsAreScriptedPerName) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    AmbientLightSensor* als = AmbientLightSensor::Create();
    EXPECT_EQ(range->Init(), 0);
    sd::SetResult(sd::kRangeInit, -5);
    sd::SetResult(sd::kAlsDisable, 7);
    EXPECT_EQ(range->Init(), -5);
    EXPECT_EQ(range->Init(), -5);
    EXPECT_EQ(range->Uninit(), 0);
    EXPECT_EQ(als->Disable(), 7);
    sd::Reset();
    EXPECT_EQ(range->Init(), 0);
    EXPECT_EQ(sd::CountOf(sd::kRangeInit), 1u);
}

TEST_F(SensorDoublesTest, QueuedRangeDataIsUsedOnceThenPersistent) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    MultiRangingData data{};
    data.valid = 9;
    range->Process(3, &data);
    EXPECT_EQ(data.valid, 0) << "default record is all zero";

    sd::SetRangeData(RangeFrame(100));
    sd::QueueRangeData(RangeFrame(1));
    sd::QueueRangeData(RangeFrame(2));
    range->Process(3, &data);
    EXPECT_EQ(data.time_ms, 1u);
    EXPECT_EQ(data.zones[1].distance_mm, 1);
    range->Process(3, &data);
    EXPECT_EQ(data.time_ms, 2u);
    range->Process(3, &data);
    EXPECT_EQ(data.time_ms, 100u);
    range->Process(3, &data);
    EXPECT_EQ(data.time_ms, 100u);
    EXPECT_EQ(data.valid, 1);
}

TEST_F(SensorDoublesTest, QueuedAlsDataIsUsedOnceThenPersistent) {
    AmbientLightSensor* als = AmbientLightSensor::Create();
    ALSResult result{};
    sd::SetAlsData(AlsSample(50.0f));
    sd::QueueAlsData(AlsSample(1.0f));
    als->ReadSingleShot(&result, true, 30);
    EXPECT_EQ(result.lux, 1.0f);
    als->ReadSingleShot(&result, true, 30);
    EXPECT_EQ(result.lux, 50.0f);
    als->ReadSingleShot(&result, true, 30);
    EXPECT_EQ(result.lux, 50.0f);
}

TEST_F(SensorDoublesTest, ResetReturnsDataToZero) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    AmbientLightSensor* als = AmbientLightSensor::Create();
    sd::SetRangeData(RangeFrame(100));
    sd::QueueRangeData(RangeFrame(1));
    sd::SetAlsData(AlsSample(50.0f));
    sd::Reset();
    MultiRangingData data = RangeFrame(5);
    ALSResult result = AlsSample(5.0f);
    range->Process(3, &data);
    als->ReadSingleShot(&result, true, 30);
    EXPECT_EQ(data.time_ms, 0u);
    EXPECT_EQ(data.valid, 0);
    EXPECT_EQ(result.lux, 0.0f);
    EXPECT_EQ(result.valid, 0);
}

TEST_F(SensorDoublesTest, DelayAppliesToTheNamedCall) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    sd::SetDelay(sd::kRangeInit, 50ms);
    auto start = std::chrono::steady_clock::now();
    range->Init();
    EXPECT_GE(std::chrono::steady_clock::now() - start, 50ms);
    start = std::chrono::steady_clock::now();
    range->Uninit();
    EXPECT_LT(std::chrono::steady_clock::now() - start, 5s);
    EXPECT_EQ(sd::CountOf(sd::kRangeUninit), 1u);
}

TEST_F(SensorDoublesTest, HoldBlocksAfterRecordingUntilRelease) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    sd::Hold(sd::kRangeProcess);
    std::atomic<bool> returned{false};
    std::thread thread([&] {
        MultiRangingData data{};
        range->Process(3, &data);
        returned = true;
    });
    ASSERT_TRUE(sd::WaitUntilHeld(sd::kRangeProcess, 5s));
    EXPECT_EQ(sd::CountOf(sd::kRangeProcess), 1u) << "recorded before blocking";
    EXPECT_FALSE(returned);
    // Other calls pass while one is held.
    EXPECT_EQ(range->Init(), 0);
    sd::Release(sd::kRangeProcess);
    thread.join();
    EXPECT_TRUE(returned);
    // Released names no longer block.
    MultiRangingData data{};
    range->Process(3, &data);
    EXPECT_FALSE(sd::WaitUntilHeld(sd::kRangeProcess, 10ms));
}

TEST_F(SensorDoublesTest, HeldCallReturnsDataQueuedWhileHeld) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    sd::Hold(sd::kRangeProcess);
    auto result = std::async(std::launch::async, [&] {
        MultiRangingData data{};
        range->Process(3, &data);
        return data.time_ms;
    });
    ASSERT_TRUE(sd::WaitUntilHeld(sd::kRangeProcess, 5s));
    sd::QueueRangeData(RangeFrame(42));
    sd::Release(sd::kRangeProcess);
    EXPECT_EQ(result.get(), 42u);
}

TEST_F(SensorDoublesTest, ReleaseBlockedHoldsTheVeryNextCall) {
    AmbientLightSensor* als = AmbientLightSensor::Create();
    sd::Hold(sd::kAlsDisable);
    // Two calls in a row: nothing between them gives the test a chance to hold again.
    std::thread caller([&] {
        als->Disable();
        als->Disable();
    });
    ASSERT_TRUE(sd::WaitUntilHeld(sd::kAlsDisable, 5s));
    sd::ReleaseBlocked(sd::kAlsDisable);
    ASSERT_TRUE(sd::WaitForCalls(sd::kAlsDisable, 2, 5s));
    EXPECT_TRUE(sd::WaitUntilHeld(sd::kAlsDisable, 5s)) << "the second call went through";
    sd::Release(sd::kAlsDisable);
    caller.join();
    EXPECT_EQ(sd::CountOf(sd::kAlsDisable), 2u);
}

TEST_F(SensorDoublesTest, WaitUntilHeldTimesOutWhenNothingBlocks) {
    sd::Hold(sd::kAlsReadSingleShot);
    EXPECT_FALSE(sd::WaitUntilHeld(sd::kAlsReadSingleShot, 20ms));
}

TEST_F(SensorDoublesTest, ReleaseThenHoldAgainStillFreesTheFirstCall) {
    AmbientLightSensor* als = AmbientLightSensor::Create();
    sd::Hold(sd::kAlsDisable);
    std::thread first([&] { als->Disable(); });
    ASSERT_TRUE(sd::WaitUntilHeld(sd::kAlsDisable, 5s));
    sd::Release(sd::kAlsDisable);
    sd::Hold(sd::kAlsDisable);
    // The released call does not count as held by the new hold.
    EXPECT_FALSE(sd::WaitUntilHeld(sd::kAlsDisable, 10ms));
    first.join();
    std::thread second([&] { als->Disable(); });
    ASSERT_TRUE(sd::WaitUntilHeld(sd::kAlsDisable, 5s));
    sd::Release(sd::kAlsDisable);
    second.join();
    EXPECT_EQ(sd::CountOf(sd::kAlsDisable), 2u);
}

TEST_F(SensorDoublesTest, ResetReleasesHeldCalls) {
    AmbientLightSensor* als = AmbientLightSensor::Create();
    sd::Hold(sd::kAlsSetTorchLightState);
    std::thread thread([&] { als->SetTorchLightState(1); });
    ASSERT_TRUE(sd::WaitUntilHeld(sd::kAlsSetTorchLightState, 5s));
    sd::Reset();
    thread.join();
    EXPECT_EQ(sd::CountOf(sd::kAlsSetTorchLightState), 0u);
}

TEST_F(SensorDoublesTest, WaitForCallsSeesCallsFromOtherThreads) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    EXPECT_FALSE(sd::WaitForCalls(sd::kRangeEnable, 1, 10ms));
    std::thread thread([&] {
        for (int i = 0; i < 3; ++i) range->Enable(i % 2 == 0);
    });
    EXPECT_TRUE(sd::WaitForCalls(sd::kRangeEnable, 3, 5s));
    thread.join();
    EXPECT_EQ(sd::CountOf(sd::kRangeEnable), 3u);
}

TEST_F(SensorDoublesTest, ConcurrentCallsAreAllRecorded) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    AmbientLightSensor* als = AmbientLightSensor::Create();
    constexpr int kPerThread = 200;
    std::thread a([&] {
        MultiRangingData data{};
        for (int i = 0; i < kPerThread; ++i) range->Process(3, &data);
    });
    std::thread b([&] {
        for (int i = 0; i < kPerThread; ++i) {
            als->enabled = (i % 2) == 0;
            als->SetTorchLightState(i & 1);
        }
    });
    std::thread c([&] {
        for (int i = 0; i < kPerThread; ++i) sd::QueueRangeData(RangeFrame(i));
    });
    a.join();
    b.join();
    c.join();
    EXPECT_EQ(sd::CountOf(sd::kRangeProcess), static_cast<size_t>(kPerThread));
    EXPECT_EQ(sd::CountOf(sd::kAlsSetTorchLightState), static_cast<size_t>(kPerThread));
}

}  // namespace
}  // namespace vyr_test::sensors
