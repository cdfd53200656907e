// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <future>
#include <map>
#include <thread>
#include <vector>

#include "ambient_light_sensor.h"
#include "log_capture.h"
#include "temp_dir.h"
#include "ubk/range_sensor.h"

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

namespace vyr_test::sensors {
namespace {

// Each test gets its own scenario file and state file; both sensors are destroyed after it.
class SensorSimulatorTest : public ::testing::Test {
  protected:
    void TearDown() override {
        AmbientLightSensor::Destroy();
        ubk::RangeSensor::Destroy();
        unsetenv("VYR_SENSOR_SCENARIO");
        unsetenv("VYR_SENSOR_STATE_FILE");
    }

    void UseScenario(const std::string& contents) {
        setenv("VYR_SENSOR_SCENARIO", dir_.Write("scenario", contents).c_str(), 1);
    }

    ubk::RangeSensor* StartRange() {
        ubk::RangeSensor* range = ubk::RangeSensor::Create();
        EXPECT_NE(range, nullptr);
        if (range == nullptr) return nullptr;
        EXPECT_EQ(range->Init(), 0);
        EXPECT_EQ(range->Enable(true), 0);
        return range;
    }

    AmbientLightSensor* StartAls() {
        AmbientLightSensor* als = AmbientLightSensor::Create();
        EXPECT_NE(als, nullptr);
        if (als != nullptr) als->enabled = true;
        return als;
    }

    // Frames by frame number, read until `count` were delivered.
    static std::map<uint32_t, MultiRangingData> ReadFrames(ubk::RangeSensor* range, int count) {
        std::map<uint32_t, MultiRangingData> frames;
        for (int i = 0; i < count; ++i) {
            MultiRangingData data{};
            EXPECT_EQ(range->Process(3, &data), 0);
            frames[data.frame_number] = data;
        }
        return frames;
    }

    // Waits until the state file holds `key`=`value`.
    bool WaitForState(const std::string& key, const std::string& value) {
        const auto deadline = Clock::now() + 5s;
        while (Clock::now() < deadline) {
            auto values = ReadKeyValues(dir_.Path("state"));
            if (values.count(key) != 0 && values[key] == value) return true;
            std::this_thread::sleep_for(5ms);
        }
        return false;
    }

    TempDir dir_;
};

TEST_F(SensorSimulatorTest, CreateReturnsTheSingleton) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ASSERT_NE(range, nullptr);
    EXPECT_EQ(ubk::RangeSensor::Create(), range);
    AmbientLightSensor* als = AmbientLightSensor::Create();
    ASSERT_NE(als, nullptr);
    EXPECT_EQ(AmbientLightSensor::Create(), als);
}

TEST_F(SensorSimulatorTest, DestroyWithoutCreateIsSafe) {
    AmbientLightSensor::Destroy();
    ubk::RangeSensor::Destroy();
    AmbientLightSensor::Destroy();
    ubk::RangeSensor::Destroy();
    EXPECT_NE(ubk::RangeSensor::Create(), nullptr);
    EXPECT_NE(AmbientLightSensor::Create(), nullptr);
}

TEST_F(SensorSimulatorTest, CreateFailuresFollowTheScenario) {
    UseScenario("als.create_fails=1\n");
    EXPECT_EQ(AmbientLightSensor::Create(), nullptr);
    EXPECT_NE(ubk::RangeSensor::Create(), nullptr);
    ubk::RangeSensor::Destroy();
    UseScenario("range.create_fails=1\n");
    EXPECT_EQ(ubk::RangeSensor::Create(), nullptr);
    EXPECT_NE(AmbientLightSensor::Create(), nullptr);
}

TEST_F(SensorSimulatorTest, InitFailsWhenTheScenarioSaysSo) {
    UseScenario("range.init_fails=1\n");
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ASSERT_NE(range, nullptr);
    EXPECT_NE(range->Init(), 0);
    ubk::RangeSensor::Destroy();
    UseScenario("range.init_fails=0\n");
    range = ubk::RangeSensor::Create();
    ASSERT_NE(range, nullptr);
    EXPECT_EQ(range->Init(), 0);
}

TEST_F(SensorSimulatorTest, ProcessWithoutRangingGivesNoValidData) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ASSERT_NE(range, nullptr);
    ASSERT_EQ(range->Init(), 0);
    MultiRangingData data{};
    data.valid = 1;
    EXPECT_NE(range->Process(3, &data), 0);
    EXPECT_EQ(data.valid, 0);
}

TEST_F(SensorSimulatorTest, ProcessDeliversSuccessiveValidFrames) {
    const auto start = Clock::now();
    ubk::RangeSensor* range = StartRange();
    ASSERT_NE(range, nullptr);
    uint32_t previous_number = 0;
    uint32_t previous_time = 0;
    for (int i = 0; i < 10; ++i) {
        MultiRangingData data{};
        ASSERT_EQ(range->Process(3, &data), 0);
        EXPECT_EQ(data.valid, 1);
        EXPECT_EQ(data.zone_count, 4);
        EXPECT_EQ(data.effective_rate, 30);
        EXPECT_EQ(data.zones[3].target_status, 5);
        if (i > 0) {
            EXPECT_GT(data.frame_number, previous_number);
            EXPECT_GE(data.time_ms, previous_time);
        }
        previous_number = data.frame_number;
        previous_time = data.time_ms;
    }
    const auto elapsed = Clock::now() - start;
    // Ten frames at 30 Hz cannot be ready sooner than ten periods after ranging started.
    EXPECT_GE(elapsed, 330ms);
    EXPECT_LT(elapsed, 10s);
    EXPECT_LE(previous_time, std::chrono::duration_cast<std::chrono::milliseconds>(elapsed).count());
}

TEST_F(SensorSimulatorTest, FrameRateComesFromControlSettings) {
    ubk::RangeSensor* range = StartRange();
    ASSERT_NE(range, nullptr);
    ControlSettings settings{};
    settings.frame_rate_hz = 10;
    EXPECT_EQ(range->ConfigureParameters(settings), 0);
    MultiRangingData first{}, second{};
    ASSERT_EQ(range->Process(3, &first), 0);
    ASSERT_EQ(range->Process(3, &second), 0);
    EXPECT_EQ(second.effective_rate, 10);
    EXPECT_EQ(second.frame_number, first.frame_number + 1);
    EXPECT_GE(second.time_ms - first.time_ms, 99u);

    for (int rate : {0, 61, -5}) {
        settings.frame_rate_hz = rate;
        range->ConfigureParameters(settings);
        MultiRangingData data{};
        ASSERT_EQ(range->Process(3, &data), 0);
        EXPECT_EQ(data.effective_rate, 10) << rate;
    }
    settings.frame_rate_hz = 60;
    range->ConfigureParameters(settings);
    MultiRangingData data{};
    ASSERT_EQ(range->Process(3, &data), 0);
    EXPECT_EQ(data.effective_rate, 60);
}

TEST_F(SensorSimulatorTest, TimeIsCountedFromInit) {
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ASSERT_NE(range, nullptr);
    std::this_thread::sleep_for(200ms);
    const auto init = Clock::now();
    ASSERT_EQ(range->Init(), 0);
    ASSERT_EQ(range->Enable(true), 0);
    MultiRangingData data{};
    ASSERT_EQ(range->Process(3, &data), 0);
    const auto since_init =
        std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - init).count();
    // Counted from Create it would be at least 200 ms more than the time since Init.
    EXPECT_LE(data.time_ms, since_init);
    // The first frame is complete one period (33 ms) after ranging starts.
    EXPECT_GE(data.time_ms, 30u);
}

TEST_F(SensorSimulatorTest, DisableEndsABlockedProcess) {
    // Left alone, the next frame would take more than six seconds.
    UseScenario("extra_latency_ms=5000\n");
    ubk::RangeSensor* range = StartRange();
    ASSERT_NE(range, nullptr);
    ControlSettings settings{};
    settings.frame_rate_hz = 1;
    range->ConfigureParameters(settings);
    const auto start = Clock::now();
    auto result = std::async(std::launch::async, [range] {
        MultiRangingData data{};
        data.valid = 1;
        const int rc = range->Process(3, &data);
        return std::make_pair(rc, data.valid);
    });
    std::this_thread::sleep_for(50ms);
    ASSERT_EQ(range->Enable(false), 0);
    const auto [rc, valid] = result.get();
    EXPECT_NE(rc, 0);
    EXPECT_EQ(valid, 0);
    EXPECT_LT(Clock::now() - start, 4s);
}

TEST_F(SensorSimulatorTest, ZoneCountFollowsTheScenario) {
    for (int zones : {0, 1, 4}) {
        UseScenario("zone_count=" + std::to_string(zones) + "\n");
        ubk::RangeSensor* range = StartRange();
        ASSERT_NE(range, nullptr);
        MultiRangingData data{};
        ASSERT_EQ(range->Process(3, &data), 0);
        EXPECT_EQ(data.zone_count, zones);
        for (int zone = 0; zone < 4; ++zone) {
            EXPECT_EQ(data.zones[zone].distance_mm != 0, zone < zones) << zones;
        }
        ubk::RangeSensor::Destroy();
    }
}

TEST_F(SensorSimulatorTest, EveryNthSampleIsInvalid) {
    UseScenario("invalid_every=3\n");
    ubk::RangeSensor* range = StartRange();
    ASSERT_NE(range, nullptr);
    int invalid_frames = 0;
    for (const auto& [number, data] : ReadFrames(range, 9)) {
        EXPECT_EQ(data.valid, (number + 1) % 3 == 0 ? 0 : 1) << number;
        if (data.valid == 0) ++invalid_frames;
    }
    EXPECT_GT(invalid_frames, 0);

    AmbientLightSensor* als = StartAls();
    ASSERT_NE(als, nullptr);
    for (int i = 0; i < 6; ++i) {
        ALSResult result{};
        als->ReadSingleShot(&result, true, 1);
        EXPECT_EQ(result.valid, (i + 1) % 3 == 0 ? 0 : 1) << i;
    }
}

TEST_F(SensorSimulatorTest, ExtraLatencyDelaysEveryRead) {
    UseScenario("extra_latency_ms=150\n");
    AmbientLightSensor* als = StartAls();
    ASSERT_NE(als, nullptr);
    auto start = Clock::now();
    ALSResult result{};
    EXPECT_EQ(als->ReadSingleShot(&result, true, 0), 0);
    EXPECT_GE(Clock::now() - start, 150ms);

    ubk::RangeSensor* range = StartRange();
    ASSERT_NE(range, nullptr);
    MultiRangingData data{};
    ASSERT_EQ(range->Process(3, &data), 0);
    start = Clock::now();
    ASSERT_EQ(range->Process(3, &data), 0);
    EXPECT_GE(Clock::now() - start, 150ms);
}

TEST_F(SensorSimulatorTest, SameSeedReplaysDifferentSeedDiffers) {
    auto run = [this](const std::string& seed) {
        UseScenario("seed=" + seed + "\n");
        ubk::RangeSensor* range = StartRange();
        AmbientLightSensor* als = StartAls();
        std::map<uint32_t, MultiRangingData> frames;
        std::vector<ALSResult> samples;
        if (range != nullptr && als != nullptr) {
            frames = ReadFrames(range, 8);
            for (int i = 0; i < 4; ++i) {
                ALSResult result{};
                als->ReadSingleShot(&result, true, 5);
                samples.push_back(result);
            }
        }
        ubk::RangeSensor::Destroy();
        AmbientLightSensor::Destroy();
        return std::make_pair(frames, samples);
    };
    const auto first = run("42");
    const auto again = run("42");
    const auto other = run("43");

    ASSERT_EQ(first.first.count(0), 1u);
    ASSERT_EQ(again.first.count(0), 1u);
    ASSERT_EQ(other.first.count(0), 1u);
    int compared = 0;
    for (const auto& [number, frame] : first.first) {
        auto it = again.first.find(number);
        if (it == again.first.end()) continue;
        ++compared;
        EXPECT_EQ(memcmp(frame.zones, it->second.zones, sizeof(frame.zones)), 0) << number;
    }
    EXPECT_GT(compared, 0);
    EXPECT_NE(
        memcmp(first.first.at(0).zones, other.first.at(0).zones, sizeof(first.first.at(0).zones)),
        0);

    ASSERT_EQ(first.second.size(), 4u);
    ASSERT_EQ(again.second.size(), 4u);
    ASSERT_EQ(other.second.size(), 4u);
    for (size_t i = 0; i < 4; ++i) {
        EXPECT_EQ(first.second[i].lux, again.second[i].lux);
        EXPECT_EQ(memcmp(first.second[i].channels, again.second[i].channels,
                         sizeof(first.second[i].channels)),
                  0);
    }
    EXPECT_NE(first.second[0].lux, other.second[0].lux);
}

TEST_F(SensorSimulatorTest, ReadSingleShotBlocksForItsIntegrationTime) {
    AmbientLightSensor* als = StartAls();
    ASSERT_NE(als, nullptr);
    ALSResult result{};
    const auto before = Clock::now();
    ASSERT_EQ(als->ReadSingleShot(&result, true, 60), 0);
    const auto after = Clock::now();
    EXPECT_GE(after - before, 60ms);
    EXPECT_EQ(result.valid, 1);
    EXPECT_EQ(result.status, 0);
    EXPECT_GT(result.lux, 0.0f);
    EXPECT_GT(result.color_temperature, 1000.0f);
    EXPECT_GE(result.timestamp_ns, before.time_since_epoch().count());
    EXPECT_LE(result.timestamp_ns, after.time_since_epoch().count());

    ALSResult at_once{};
    EXPECT_EQ(als->ReadSingleShot(&at_once, false, 255), 0);
    EXPECT_EQ(at_once.valid, 1);
    EXPECT_GT(at_once.timestamp_ns, result.timestamp_ns);
}

TEST_F(SensorSimulatorTest, ReadWhileNotEnabledIsInvalid) {
    AmbientLightSensor* als = AmbientLightSensor::Create();
    ASSERT_NE(als, nullptr);
    ALSResult result{};
    result.valid = 1;
    EXPECT_NE(als->ReadSingleShot(&result, true, 1), 0);
    EXPECT_EQ(result.valid, 0);
}

TEST_F(SensorSimulatorTest, TorchChangesTheLight) {
    AmbientLightSensor* als = StartAls();
    ASSERT_NE(als, nullptr);
    ALSResult dark{}, lit{}, dark_again{};
    ASSERT_EQ(als->ReadSingleShot(&dark, true, 1), 0);
    EXPECT_EQ(als->SetTorchLightState(1), 0);
    ASSERT_EQ(als->ReadSingleShot(&lit, true, 1), 0);
    EXPECT_EQ(als->SetTorchLightState(0), 0);
    ASSERT_EQ(als->ReadSingleShot(&dark_again, true, 1), 0);
    EXPECT_GT(lit.lux, dark.lux + 500.0f);
    EXPECT_NE(lit.color_temperature, dark.color_temperature);
    EXPECT_LT(dark_again.lux, lit.lux - 500.0f);
}

TEST_F(SensorSimulatorTest, StateFileFollowsTheSensors) {
    const std::string state = dir_.Path("state");
    setenv("VYR_SENSOR_STATE_FILE", state.c_str(), 1);
    ubk::RangeSensor* range = ubk::RangeSensor::Create();
    ASSERT_NE(range, nullptr);
    EXPECT_TRUE(WaitForState("range.created", "1"));
    EXPECT_TRUE(WaitForState("range.initialized", "0"));
    EXPECT_TRUE(WaitForState("range.enabled", "0"));
    range->Init();
    EXPECT_TRUE(WaitForState("range.initialized", "1"));
    range->Enable(true);
    EXPECT_TRUE(WaitForState("range.enabled", "1"));
    range->Enable(false);
    EXPECT_TRUE(WaitForState("range.enabled", "0"));
    range->Uninit();
    EXPECT_TRUE(WaitForState("range.initialized", "0"));

    AmbientLightSensor* als = AmbientLightSensor::Create();
    ASSERT_NE(als, nullptr);
    EXPECT_TRUE(WaitForState("als.enabled", "0"));
    als->enabled = true;
    // The simulator learns of the flag at the next read, which the service makes at once.
    ALSResult reading{};
    als->ReadSingleShot(&reading, false, 30);
    EXPECT_TRUE(WaitForState("als.enabled", "1"));
    als->SetTorchLightState(1);
    EXPECT_TRUE(WaitForState("torch", "1"));
    als->enabled = false;
    EXPECT_TRUE(WaitForState("als.enabled", "0"));

    AmbientLightSensor::Destroy();
    ubk::RangeSensor::Destroy();
    EXPECT_TRUE(WaitForState("als.created", "0"));
    EXPECT_TRUE(WaitForState("range.created", "0"));
    // Only the published file remains: the temporary files were renamed over it.
    size_t files = 0;
    for (const auto& entry :
         std::filesystem::directory_iterator(std::filesystem::path(state).parent_path())) {
        if (entry.path().filename() != "scenario") ++files;
    }
    EXPECT_EQ(files, 1u);
}

TEST_F(SensorSimulatorTest, CallsFromManyThreadsAreSafe) {
    ubk::RangeSensor* range = StartRange();
    AmbientLightSensor* als = StartAls();
    ASSERT_NE(range, nullptr);
    ASSERT_NE(als, nullptr);
    std::atomic<bool> stop{false};
    std::atomic<int> frames{0}, samples{0};
    std::vector<std::thread> threads;
    threads.emplace_back([&] {
        while (!stop) {
            MultiRangingData data{};
            if (range->Process(3, &data) == 0) ++frames;
        }
    });
    threads.emplace_back([&] {
        while (!stop) {
            ALSResult result{};
            if (als->ReadSingleShot(&result, true, 5) == 0) ++samples;
        }
    });
    threads.emplace_back([&] {
        ControlSettings settings{};
        for (int i = 0; !stop; ++i) {
            settings.frame_rate_hz = (i / 50) % 2 == 0 ? 30 : 45;
            range->ConfigureParameters(settings);
            range->Enable(true);
            range->Init();
            als->SetTorchLightState(i & 1);
            als->Disable();
            std::this_thread::sleep_for(2ms);
        }
    });
    std::this_thread::sleep_for(400ms);
    stop = true;
    for (auto& thread : threads) thread.join();
    EXPECT_GT(frames.load(), 0);
    EXPECT_GT(samples.load(), 0);
}

// A range frame as vyrctl stream --json prints it, with one zone at `distance_mm`.
std::string RecordedFrame(uint32_t time_ms, int distance_mm) {
    return "{\"format\":1,\"sensor\":\"range\",\"handle\":1,\"status\":0,\"timestamp\":" +
           std::to_string(time_ms) + ",\"value0\":0,\"value1\":0,\"data\":[" +
           std::to_string(time_ms) + ",0,0,0,1,30,27,0,1," + std::to_string(time_ms / 10) + ",5," +
           std::to_string(distance_mm) + ",3,900,40,1200,800,1,95,40,0]}\n";
}

TEST_F(SensorSimulatorTest, ARangeReplayHandsOutTheRecordedFramesInOrder) {
    dir_.Write("walk.jsonl",
               RecordedFrame(500, 1500) + RecordedFrame(530, 1400) + RecordedFrame(560, 1300));
    // A relative path is read from the scenario file's folder.
    UseScenario("range.replay = walk.jsonl\n");
    ubk::RangeSensor* range = StartRange();
    ASSERT_NE(range, nullptr);
    std::vector<int> distances;
    std::vector<uint32_t> times;
    for (int i = 0; i < 4; ++i) {
        MultiRangingData data{};
        ASSERT_EQ(range->Process(3, &data), 0);
        EXPECT_EQ(data.valid, 1);
        distances.push_back(data.zones[0].distance_mm);
        times.push_back(data.time_ms);
    }
    // Without a loop the last frame stays.
    EXPECT_EQ(distances, (std::vector<int>{1500, 1400, 1300, 1300}));
    EXPECT_EQ(times, (std::vector<uint32_t>{500, 530, 560, 560}));
}

TEST_F(SensorSimulatorTest, AReplayFileThatIsNoRecordingFailsCreateWithItsLine) {
    vyr_test::LogCapture log;
    const std::string path = dir_.Write("bad.jsonl", RecordedFrame(0, 1000) + "frame two\n");
    UseScenario("range.replay=" + path + "\nals.replay=" + dir_.Path("none.jsonl") + "\n");
    EXPECT_EQ(ubk::RangeSensor::Create(), nullptr);
    EXPECT_TRUE(
        log.Contains("sensors_sim", ANDROID_LOG_ERROR,
                     "range sensor Create failed: range.replay " + path + ":2: not a JSON object"));
    EXPECT_EQ(AmbientLightSensor::Create(), nullptr);
    EXPECT_TRUE(log.Contains("sensors_sim", ANDROID_LOG_ERROR,
                             "ambient light sensor Create failed: als.replay " +
                                 dir_.Path("none.jsonl") + ": cannot be read"));
}

TEST_F(SensorSimulatorTest, ALightReplayLoopsAndStopsWhenTheSensorGoesOff) {
    std::string lines;
    for (int i = 0; i < 3; ++i) {
        lines += "{\"sensor\":\"als\",\"status\":0,\"timestamp\":" +
                 std::to_string(1000000 + i * 20000000) +
                 ",\"value0\":4000,\"value1\":" + std::to_string(100 + i) +
                 ",\"data\":[1,2,3,5,4]}\n";
    }
    dir_.Write("light.jsonl", lines);
    UseScenario("als.replay=light.jsonl\nals.replay.loop=1\n");
    AmbientLightSensor* als = StartAls();
    ASSERT_NE(als, nullptr);
    std::vector<float> lux;
    for (int i = 0; i < 7; ++i) {
        ALSResult result{};
        ASSERT_EQ(als->ReadSingleShot(&result, false, 0), 0);
        lux.push_back(result.lux);
        EXPECT_EQ(result.channels[3], 4);
        EXPECT_EQ(result.channels[4], 5);
    }
    EXPECT_EQ(lux, (std::vector<float>{100, 101, 102, 100, 101, 102, 100}));
    als->enabled = false;
    ALSResult result{};
    EXPECT_EQ(als->ReadSingleShot(&result, false, 0), -EIO);
}

}  // namespace
}  // namespace vyr_test::sensors
