// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <aidl/android/vyr/Event.h>
#include <android/binder_auto_utils.h>
#include <android/binder_parcel.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <vector>

namespace vyr_test::sensors {
namespace {

using aidl::android::vyr::Event;

Event MakeEvent(size_t data_size) {
    Event event;
    event.status = 0xff;
    event.timestamp = 0x0123456789abcdefLL;
    event.value0 = 1.5f;
    event.value1 = -3.25e7f;
    event.data.clear();
    for (size_t i = 0; i < data_size; ++i) {
        event.data.push_back(static_cast<float>(i) * 0.75f - 10.0f);
    }
    return event;
}

Event BlankEvent() {
    Event event;
    event.status = 0;
    event.timestamp = 0;
    event.value0 = 0.0f;
    event.value1 = 0.0f;
    event.data = {99.0f};
    return event;
}

bool SameBits(float a, float b) {
    return memcmp(&a, &b, sizeof(a)) == 0;
}

void ExpectSame(const Event& expected, const Event& actual) {
    EXPECT_EQ(actual.status, expected.status);
    EXPECT_EQ(actual.timestamp, expected.timestamp);
    EXPECT_TRUE(SameBits(actual.value0, expected.value0));
    EXPECT_TRUE(SameBits(actual.value1, expected.value1));
    ASSERT_EQ(actual.data.size(), expected.data.size());
    for (size_t i = 0; i < expected.data.size(); ++i) {
        EXPECT_TRUE(SameBits(actual.data[i], expected.data[i])) << i;
    }
}

Event RoundTrip(const Event& event) {
    ndk::ScopedAParcel parcel(AParcel_create());
    EXPECT_NE(parcel.get(), nullptr);
    EXPECT_EQ(event.writeToParcel(parcel.get()), STATUS_OK);
    const int32_t written = AParcel_getDataPosition(parcel.get());
    EXPECT_EQ(AParcel_setDataPosition(parcel.get(), 0), STATUS_OK);
    Event read = BlankEvent();
    EXPECT_EQ(read.readFromParcel(parcel.get()), STATUS_OK);
    EXPECT_EQ(AParcel_getDataPosition(parcel.get()), written) << "read exactly what was written";
    return read;
}

TEST(EventParcelTest, EveryFieldSurvivesWithAFullRangeFrame) {
    // A four-zone range frame: 10 header values and 11 per zone.
    const Event event = MakeEvent(10 + 11 * 4);
    ASSERT_EQ(event.data.size(), 54u);
    ExpectSame(event, RoundTrip(event));
}

TEST(EventParcelTest, EmptyDataSurvives) {
    const Event event = MakeEvent(0);
    ExpectSame(event, RoundTrip(event));
}

TEST(EventParcelTest, ExtremeValuesSurvive) {
    Event event = MakeEvent(0);
    event.status = std::numeric_limits<int32_t>::min();
    event.timestamp = std::numeric_limits<int64_t>::min();
    event.value0 = std::numeric_limits<float>::infinity();
    event.value1 = -0.0f;
    event.data = {std::numeric_limits<float>::quiet_NaN(), std::numeric_limits<float>::denorm_min(),
                  std::numeric_limits<float>::max(), -std::numeric_limits<float>::infinity(),
                  4294967295.0f};
    ExpectSame(event, RoundTrip(event));
    event.status = std::numeric_limits<int32_t>::max();
    event.timestamp = std::numeric_limits<int64_t>::max();
    ExpectSame(event, RoundTrip(event));
}

TEST(EventParcelTest, ConsecutiveEventsInOneParcel) {
    const Event first = MakeEvent(5);
    Event second = MakeEvent(54);
    second.status = 3;
    second.timestamp = 42;
    ndk::ScopedAParcel parcel(AParcel_create());
    ASSERT_EQ(first.writeToParcel(parcel.get()), STATUS_OK);
    ASSERT_EQ(second.writeToParcel(parcel.get()), STATUS_OK);
    ASSERT_EQ(AParcel_setDataPosition(parcel.get(), 0), STATUS_OK);
    Event read_first = BlankEvent(), read_second = BlankEvent();
    ASSERT_EQ(read_first.readFromParcel(parcel.get()), STATUS_OK);
    ASSERT_EQ(read_second.readFromParcel(parcel.get()), STATUS_OK);
    ExpectSame(first, read_first);
    ExpectSame(second, read_second);
}

TEST(EventParcelTest, ReadingPastTheEndFails) {
    ndk::ScopedAParcel parcel(AParcel_create());
    Event event = BlankEvent();
    EXPECT_NE(event.readFromParcel(parcel.get()), STATUS_OK);
}

}  // namespace
}  // namespace vyr_test::sensors
