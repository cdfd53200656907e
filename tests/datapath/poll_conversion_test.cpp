// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// PollOnce: the Event made from each sensor record, and each sample taken once per handle.

#include <aidl/android/vyr/Event.h>
#include <android/log.h>

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "data_path_fixture.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;

constexpr char kInvalidData[] = "PollInternal, invalid data";

RangingZone Zone(uint8_t base) {
    RangingZone zone{};
    zone.target_status = base;
    zone.distance_mm = static_cast<int16_t>(1000 + base);
    zone.sigma_mm = static_cast<int16_t>(base + 1);
    zone.signal_rate = 100000u + base;
    zone.ambient_rate = 200000u + base;
    zone.spad_count = 300u + base;
    zone.min_distance_mm = static_cast<int16_t>(900 + base);
    zone.target_count = static_cast<uint8_t>(base + 2);
    zone.confidence = static_cast<uint8_t>(base + 3);
    zone.reflectance = static_cast<uint8_t>(base + 4);
    zone.flags = static_cast<uint8_t>(base + 5);
    return zone;
}

std::vector<float> ZoneFloats(const RangingZone& z) {
    return {static_cast<float>(z.target_status),
            static_cast<float>(z.distance_mm),
            static_cast<float>(z.sigma_mm),
            static_cast<float>(z.signal_rate),
            static_cast<float>(z.ambient_rate),
            static_cast<float>(z.spad_count),
            static_cast<float>(z.min_distance_mm),
            static_cast<float>(z.target_count),
            static_cast<float>(z.confidence),
            static_cast<float>(z.reflectance),
            static_cast<float>(z.flags)};
}

// A frame whose extremes tell unsigned from signed conversion apart.
MultiRangingData ExtremeFrame(uint8_t zone_count) {
    MultiRangingData data{};
    data.time_ms = 0xFFFFFFFFu;
    data.stream_count = 0xFE;
    data.device_status = 7;
    data.zone_count = zone_count;
    data.frame_flags = 0x80;
    for (int i = 0; i < kMaxRangingZones; ++i) data.zones[i] = Zone(static_cast<uint8_t>(10 * i));
    data.zones[0].distance_mm = -5;
    data.zones[0].signal_rate = 0xFFFFFFFFu;
    data.zones[1].min_distance_mm = -32768;
    data.zones[1].target_status = 255;
    data.range_state = 0xF0;
    data.effective_rate = 0xFFFF;
    data.temperature_c = -5;
    data.error_flags = 0xFF;
    data.valid = 1;
    data.frame_number = 0xFFFFFFFFu;
    return data;
}

std::vector<float> ExpectedRangeData(const MultiRangingData& d) {
    std::vector<float> expected = {4294967295.0f, 254.0f, 7.0f,
                                   128.0f,        240.0f, 65535.0f,
                                   -5.0f,         255.0f, static_cast<float>(d.zone_count),
                                   4294967295.0f};
    for (int i = 0; i < d.zone_count; ++i) {
        std::vector<float> zone = ZoneFloats(d.zones[i]);
        expected.insert(expected.end(), zone.begin(), zone.end());
    }
    return expected;
}

ALSResult AlsSample() {
    ALSResult data{};
    data.status = 0xAB;
    data.channels[0] = 1.5f;
    data.channels[1] = 2.5f;
    data.channels[2] = 3.5f;
    data.channels[3] = 4.5f;
    data.channels[4] = 5.5f;
    data.reserved = 0xDEADBEEF;
    data.lux = 321.25f;
    data.color_temperature = 4567.5f;
    data.valid = 1;
    data.timestamp_ns = 0x123456789ABCDEF0;
    return data;
}

// A filled Event, so that a poll that must leave it alone can be checked.
Event Sentinel() {
    Event event{};
    event.status = 9;
    event.timestamp = -77;
    event.value0 = 1.25f;
    event.value1 = -2.5f;
    event.data = {42.0f};
    return event;
}

void ExpectSentinel(const Event& event) {
    EXPECT_EQ(event.status, 9);
    EXPECT_EQ(event.timestamp, -77);
    EXPECT_EQ(event.value0, 1.25f);
    EXPECT_EQ(event.value1, -2.5f);
    EXPECT_EQ(event.data, std::vector<float>{42.0f});
}

class PollTest : public DataPathTest {
  protected:
    // A client of `mode` sampling with its reads held, so the sample set beforehand stays the one
    // stored: its handle.
    int32_t OpenSampling(int32_t mode) {
        const int32_t handle = Open(mode);
        EXPECT_GT(handle, 0);
        StartHeldSampling(handle, mode);
        return handle;
    }
    // Two range clients, both open before the first starts sampling with its reads held, so the
    // second has not taken the stored sample: their handles.
    std::pair<int32_t, int32_t> OpenSamplerAndIdle() {
        const int32_t sampler = Open(kRange);
        const int32_t idle = Open(kRange);
        for (int32_t handle : {sampler, idle}) EXPECT_GT(handle, 0);
        StartHeldSampling(sampler, kRange);
        return {sampler, idle};
    }
    // Polls `handle` twice where it has no valid sample to take: each poll leaves the event alone,
    // and the invalid data is logged once in all.
    void ExpectInvalidDataLoggedOnce(int32_t handle) {
        for (int poll = 1; poll <= 2; ++poll) {
            SCOPED_TRACE("poll " + std::to_string(poll));
            Event event = Sentinel();
            EXPECT_EQ(Poll(handle, &event), -61);
            ExpectSentinel(event);
            EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_WARN, kInvalidData), 1u);
        }
    }
};

TEST_F(PollTest, RangeEventWithTwoZonesHoldsEveryFieldAsConverted) {
    MultiRangingData frame = ExtremeFrame(2);
    sensor_doubles::SetRangeData(frame);
    const int32_t handle = OpenSampling(kRange);

    Event event = Sentinel();
    ASSERT_EQ(Poll(handle, &event), 0);
    EXPECT_EQ(event.status, 0);
    EXPECT_EQ(event.timestamp, 4294967295LL);
    EXPECT_EQ(event.value0, 0.0f);
    EXPECT_EQ(event.value1, 0.0f);
    ASSERT_EQ(event.data.size(), 32u);
    EXPECT_EQ(event.data, ExpectedRangeData(frame));
    // Zone 0: distance -5 (signed 16-bit), signal 0xFFFFFFFF (unsigned 32-bit).
    EXPECT_EQ(event.data[11], -5.0f);
    EXPECT_EQ(event.data[13], 4294967295.0f);
    EXPECT_EQ(event.data[21], 255.0f);
    EXPECT_EQ(event.data[27], -32768.0f);
}

TEST_F(PollTest, RangeEventWithNoZonesHoldsTheHeaderOnly) {
    MultiRangingData frame = ExtremeFrame(0);
    sensor_doubles::SetRangeData(frame);
    const int32_t handle = OpenSampling(kRange);

    Event event{};
    ASSERT_EQ(Poll(handle, &event), 0);
    ASSERT_EQ(event.data.size(), 10u);
    EXPECT_EQ(event.data, ExpectedRangeData(frame));
}

TEST_F(PollTest, AlsEventSwapsTheLastTwoChannels) {
    sensor_doubles::SetAlsData(AlsSample());
    const int32_t handle = OpenSampling(kAls);

    Event event = Sentinel();
    ASSERT_EQ(Poll(handle, &event), 0);
    EXPECT_EQ(event.status, 0xAB) << "the status byte is zero-extended";
    EXPECT_EQ(event.timestamp, 0x123456789ABCDEF0);
    EXPECT_EQ(event.value0, 4567.5f) << "value0 is the colour temperature";
    EXPECT_EQ(event.value1, 321.25f) << "value1 is the lux value";
    EXPECT_EQ(event.data, (std::vector<float>{1.5f, 2.5f, 3.5f, 5.5f, 4.5f}));
}

TEST_F(PollTest, EachHandleTakesASampleOnce) {
    sensor_doubles::SetRangeData(ExtremeFrame(1));
    const auto [sampler, other] = OpenSamplerAndIdle();

    Event first{};
    ASSERT_EQ(Poll(sampler, &first), 0);
    Event again = Sentinel();
    EXPECT_EQ(Poll(sampler, &again), -61);
    ExpectSentinel(again);

    // A handle that is not enabled still takes the same sample, once.
    Event from_other{};
    ASSERT_EQ(Poll(other, &from_other), 0);
    EXPECT_EQ(from_other.data, first.data);
    EXPECT_EQ(from_other.timestamp, first.timestamp);
    Event other_again = Sentinel();
    EXPECT_EQ(Poll(other, &other_again), -61);
    ExpectSentinel(other_again);

    // The next sample is new to both.
    MultiRangingData next = ExtremeFrame(1);
    next.time_ms = 5;
    sensor_doubles::SetRangeData(next);
    PublishNextSample();
    Event fresh{};
    ASSERT_EQ(Poll(sampler, &fresh), 0);
    EXPECT_EQ(fresh.timestamp, 5);
    ASSERT_EQ(Poll(other, &fresh), 0);
    EXPECT_EQ(fresh.timestamp, 5);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_WARN, kInvalidData), 0u);
}

TEST_F(PollTest, NoSampleYetIsInvalidDataLoggedOnce) {
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    ExpectInvalidDataLoggedOnce(handle);
}

TEST_F(PollTest, InvalidSampleIsLoggedOnceAndLeavesTheEventAlone) {
    MultiRangingData frame = ExtremeFrame(2);
    frame.valid = 0;
    sensor_doubles::SetRangeData(frame);
    const int32_t handle = OpenSampling(kRange);
    log_.Clear();
    ExpectInvalidDataLoggedOnce(handle);

    // An invalid ambient-light sample too.
    ALSResult als = AlsSample();
    als.valid = 0;
    sensor_doubles::SetAlsData(als);
    int32_t light = Open(kAls);
    EXPECT_GT(light, 0);
    EXPECT_EQ(0, Enable(light, 1));
    ASSERT_TRUE(sensor_doubles::WaitForCalls(sensor_doubles::kAlsReadSingleShot, 2, kWait));
    // Every stored sample is invalid, so no poll ever succeeds.
    Event event = Sentinel();
    EXPECT_EQ(Poll(light, &event), -61);
    ExpectSentinel(event);
}

TEST_F(PollTest, UnknownHandleIsInvalidArgument) {
    Event event = Sentinel();
    int32_t result = 0;
    ndk::ScopedAStatus status = service_->PollOnce(12345, &event, &result);
    EXPECT_TRUE(status.isOk());
    EXPECT_EQ(result, -22);
    ExpectSentinel(event);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_ERROR, "PollOnce, invalid handle"), 1u);
}

TEST_F(PollTest, StoredSampleOutlivesSampling) {
    sensor_doubles::SetRangeData(ExtremeFrame(2));
    const auto [sampler, late] = OpenSamplerAndIdle();
    Event event{};
    ASSERT_EQ(Poll(sampler, &event), 0);

    // Stop sampling while the next read is held; the read that returns after the stop is dropped.
    size_t enables = sensor_doubles::CountOf(sensor_doubles::kRangeEnable);
    Disable(sampler);
    ASSERT_TRUE(sensor_doubles::WaitForCalls(sensor_doubles::kRangeEnable, enables + 1, kWait));
    sensor_doubles::SetRangeData(MultiRangingData{});
    sensor_doubles::Release(sensor_doubles::kRangeProcess);
    WaitForIdleWorkers();

    Event stored{};
    ASSERT_EQ(Poll(late, &stored), 0);
    EXPECT_EQ(stored.data, event.data);
    EXPECT_EQ(Poll(late, &stored), -61);
    EXPECT_EQ(Poll(sampler, &stored), -61);
}

}  // namespace
}  // namespace vyr_test::datapath
