// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <aidl/android/vyr/Event.h>
#include <android/binder_parcel_utils.h>
#include <gtest/gtest.h>

#include <cfloat>
#include <climits>
#include <cstring>
#include <optional>
#include <string>
#include <vector>

#include "echo_binder.h"

namespace vyr_test::binder {
namespace {

using aidl::android::vyr::Event;

class ParcelTest : public ::testing::Test {
  protected:
    void Rewind() { ASSERT_EQ(STATUS_OK, AParcel_setDataPosition(parcel_.get(), 0)); }
    ndk::ScopedAParcel parcel_{AParcel_create()};
};

TEST_F(ParcelTest, PrimitivesRoundTrip) {
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, INT32_MIN));
    ASSERT_EQ(STATUS_OK, AParcel_writeUint32(p, UINT32_MAX));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt64(p, INT64_MIN));
    ASSERT_EQ(STATUS_OK, AParcel_writeUint64(p, UINT64_MAX));
    ASSERT_EQ(STATUS_OK, AParcel_writeFloat(p, FLT_MIN));
    ASSERT_EQ(STATUS_OK, AParcel_writeDouble(p, DBL_MAX));
    ASSERT_EQ(STATUS_OK, AParcel_writeBool(p, true));
    ASSERT_EQ(STATUS_OK, AParcel_writeChar(p, u'\u20ac'));
    ASSERT_EQ(STATUS_OK, AParcel_writeByte(p, -7));
    Rewind();
    int32_t i32;
    uint32_t u32;
    int64_t i64;
    uint64_t u64;
    float f;
    double d;
    bool b;
    char16_t c;
    int8_t y;
    ASSERT_EQ(STATUS_OK, AParcel_readInt32(p, &i32));
    ASSERT_EQ(STATUS_OK, AParcel_readUint32(p, &u32));
    ASSERT_EQ(STATUS_OK, AParcel_readInt64(p, &i64));
    ASSERT_EQ(STATUS_OK, AParcel_readUint64(p, &u64));
    ASSERT_EQ(STATUS_OK, AParcel_readFloat(p, &f));
    ASSERT_EQ(STATUS_OK, AParcel_readDouble(p, &d));
    ASSERT_EQ(STATUS_OK, AParcel_readBool(p, &b));
    ASSERT_EQ(STATUS_OK, AParcel_readChar(p, &c));
    ASSERT_EQ(STATUS_OK, AParcel_readByte(p, &y));
    EXPECT_EQ(INT32_MIN, i32);
    EXPECT_EQ(UINT32_MAX, u32);
    EXPECT_EQ(INT64_MIN, i64);
    EXPECT_EQ(UINT64_MAX, u64);
    EXPECT_EQ(FLT_MIN, f);
    EXPECT_EQ(DBL_MAX, d);
    EXPECT_TRUE(b);
    EXPECT_EQ(u'\u20ac', c);
    EXPECT_EQ(-7, y);
    EXPECT_EQ(STATUS_NOT_ENOUGH_DATA, AParcel_readInt32(p, &i32));
    EXPECT_EQ(AParcel_getDataSize(p), AParcel_getDataPosition(p));
}

TEST_F(ParcelTest, VectorsRoundTrip) {
    AParcel* p = parcel_.get();
    std::vector<int32_t> i32{1, -2, INT32_MAX};
    std::vector<uint32_t> u32{7, UINT32_MAX};
    std::vector<int64_t> i64{INT64_MAX, -1};
    std::vector<uint64_t> u64{UINT64_MAX};
    std::vector<float> f{0.5f, -1.0f, 3.25f};
    std::vector<double> d{1e300};
    std::vector<bool> b{true, false, true};
    std::vector<char16_t> c{u'a', u'\u00e9'};
    std::vector<int8_t> y{-1, 2, 3};
    std::vector<uint8_t> u8{255, 0, 1, 2, 3};
    std::vector<std::string> s{"", "abc", "\xc3\xa9t\xc3\xa9"};
    std::optional<std::vector<int32_t>> null_vector;
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, i32));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, u32));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, i64));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, u64));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, f));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, d));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, b));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, c));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, y));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, u8));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, s));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, null_vector));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, std::vector<int32_t>{}));
    Rewind();
    decltype(i32) ri32;
    decltype(u32) ru32;
    decltype(i64) ri64;
    decltype(u64) ru64;
    decltype(f) rf;
    decltype(d) rd;
    decltype(b) rb;
    decltype(c) rc;
    decltype(y) ry;
    decltype(u8) ru8;
    decltype(s) rs;
    std::optional<std::vector<int32_t>> rnull = std::vector<int32_t>{1};
    std::vector<int32_t> rempty{5};
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &ri32));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &ru32));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &ri64));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &ru64));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &rf));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &rd));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &rb));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &rc));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &ry));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &ru8));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &rs));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &rnull));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &rempty));
    EXPECT_EQ(i32, ri32);
    EXPECT_EQ(u32, ru32);
    EXPECT_EQ(i64, ri64);
    EXPECT_EQ(u64, ru64);
    EXPECT_EQ(f, rf);
    EXPECT_EQ(d, rd);
    EXPECT_EQ(b, rb);
    EXPECT_EQ(c, rc);
    EXPECT_EQ(y, ry);
    EXPECT_EQ(u8, ru8);
    EXPECT_EQ(s, rs);
    EXPECT_FALSE(rnull.has_value());
    EXPECT_TRUE(rempty.empty());
}

TEST_F(ParcelTest, StringsRoundTripAndNull) {
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeString(p, std::string("hello")));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeString(p, std::optional<std::string>()));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeString(p, std::string()));
    Rewind();
    std::string s;
    std::optional<std::string> null_string = "x";
    std::string empty = "y";
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readString(p, &s));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readString(p, &null_string));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readString(p, &empty));
    EXPECT_EQ("hello", s);
    EXPECT_FALSE(null_string.has_value());
    EXPECT_EQ("", empty);
}

TEST_F(ParcelTest, NullIntoNonNullableIsUnexpectedNull) {
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeString(p, std::optional<std::string>()));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, std::optional<std::vector<float>>()));
    Rewind();
    std::string s;
    std::vector<float> v;
    EXPECT_EQ(STATUS_UNEXPECTED_NULL, ndk::AParcel_readString(p, &s));
    EXPECT_EQ(STATUS_UNEXPECTED_NULL, ndk::AParcel_readVector(p, &v));
}

TEST_F(ParcelTest, InvalidUtf8IsRefused) {
    EXPECT_EQ(STATUS_BAD_VALUE, AParcel_writeString(parcel_.get(), "\xff\xfe", 2));
    EXPECT_EQ(STATUS_BAD_VALUE, AParcel_writeString(parcel_.get(), "ab", -2));
}

TEST_F(ParcelTest, ArrayLengthBeyondDataIsRefusedBeforeAllocating) {
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, INT32_MAX));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, 1));
    Rewind();
    bool allocated = false;
    binder_status_t status =
        AParcel_readInt64Array(p, &allocated, [](void* data, int32_t, int64_t**) {
            *static_cast<bool*>(data) = true;
            return false;
        });
    EXPECT_EQ(STATUS_NOT_ENOUGH_DATA, status);
    EXPECT_FALSE(allocated);
}

TEST_F(ParcelTest, NegativeLengthsAreBadValues) {
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, -5));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, -5));
    Rewind();
    std::vector<int32_t> v;
    std::string s;
    EXPECT_EQ(STATUS_BAD_VALUE, ndk::AParcel_readVector(p, &v));
    EXPECT_EQ(STATUS_BAD_VALUE, ndk::AParcel_readString(p, &s));
    EXPECT_EQ(STATUS_BAD_VALUE, AParcel_writeInt32Array(p, nullptr, 3));
    EXPECT_EQ(STATUS_BAD_VALUE, AParcel_writeInt32Array(p, v.data(), -2));
    EXPECT_EQ(STATUS_BAD_VALUE, AParcel_setDataPosition(p, -1));
}

TEST_F(ParcelTest, TruncatedStringIsNotEnoughData) {
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, 100));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, 0x41414141));
    Rewind();
    std::string s;
    EXPECT_EQ(STATUS_NOT_ENOUGH_DATA, ndk::AParcel_readString(p, &s));
}

TEST_F(ParcelTest, StatusHeaderRoundTrip) {
    AParcel* p = parcel_.get();
    ndk::ScopedAStatus specific =
        ndk::ScopedAStatus::fromServiceSpecificErrorWithMessage(42, "sensor busy");
    ndk::ScopedAStatus illegal = ndk::ScopedAStatus::fromExceptionCode(EX_ILLEGAL_ARGUMENT);
    ASSERT_EQ(STATUS_OK, AParcel_writeStatusHeader(p, ndk::ScopedAStatus::ok().get()));
    ASSERT_EQ(STATUS_OK, AParcel_writeStatusHeader(p, specific.get()));
    ASSERT_EQ(STATUS_OK, AParcel_writeStatusHeader(p, illegal.get()));
    ndk::ScopedAStatus transport = ndk::ScopedAStatus::fromStatus(STATUS_DEAD_OBJECT);
    EXPECT_EQ(STATUS_DEAD_OBJECT, AParcel_writeStatusHeader(p, transport.get()));
    Rewind();
    ndk::ScopedAStatus ok, rspecific, rillegal;
    ASSERT_EQ(STATUS_OK, AParcel_readStatusHeader(p, ok.getR()));
    ASSERT_EQ(STATUS_OK, AParcel_readStatusHeader(p, rspecific.getR()));
    ASSERT_EQ(STATUS_OK, AParcel_readStatusHeader(p, rillegal.getR()));
    EXPECT_TRUE(ok.isOk());
    EXPECT_EQ(EX_SERVICE_SPECIFIC, rspecific.getExceptionCode());
    EXPECT_EQ(42, rspecific.getServiceSpecificError());
    EXPECT_STREQ("sensor busy", rspecific.getMessage());
    EXPECT_EQ(EX_ILLEGAL_ARGUMENT, rillegal.getExceptionCode());
    EXPECT_EQ(STATUS_OK, rillegal.getStatus());
}

TEST_F(ParcelTest, ParcelableRoundTripAndVectorOfParcelables) {
    Event event;
    event.status = -3;
    event.timestamp = 123456789012345LL;
    event.value0 = 1.25f;
    event.value1 = -0.5f;
    event.data = {1.0f, 2.0f, 3.0f};
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, event.writeToParcel(p));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeVector(p, std::vector<Event>{event, event}));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, 77));
    Rewind();
    Event read;
    std::vector<Event> many;
    int32_t tail;
    ASSERT_EQ(STATUS_OK, read.readFromParcel(p));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readVector(p, &many));
    ASSERT_EQ(STATUS_OK, AParcel_readInt32(p, &tail));
    EXPECT_EQ(event.status, read.status);
    EXPECT_EQ(event.timestamp, read.timestamp);
    EXPECT_EQ(event.value0, read.value0);
    EXPECT_EQ(event.value1, read.value1);
    EXPECT_EQ(event.data, read.data);
    ASSERT_EQ(2u, many.size());
    EXPECT_EQ(event.data, many[1].data);
    EXPECT_EQ(77, tail);
}

TEST_F(ParcelTest, NullBinderRoundTripAndBadObjectIndex) {
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, AParcel_writeStrongBinder(p, nullptr));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, 1));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(p, 9));
    Rewind();
    AIBinder* binder = reinterpret_cast<AIBinder*>(0x1);
    ASSERT_EQ(STATUS_OK, AParcel_readStrongBinder(p, &binder));
    EXPECT_EQ(nullptr, binder);
    EXPECT_EQ(STATUS_BAD_VALUE, AParcel_readStrongBinder(p, &binder));
}

TEST_F(ParcelTest, LocalBinderRoundTripHoldsAReference) {
    ndk::SpAIBinder binder = vyr_test::binder::MakeEcho();
    AParcel* p = parcel_.get();
    ASSERT_EQ(STATUS_OK, AParcel_writeStrongBinder(p, binder.get()));
    ASSERT_EQ(STATUS_OK, AParcel_writeStrongBinder(p, binder.get()));
    EXPECT_EQ(3, AIBinder_debugGetRefCount(binder.get()));
    Rewind();
    ndk::SpAIBinder first;
    ndk::SpAIBinder second;
    ASSERT_EQ(STATUS_OK, AParcel_readStrongBinder(p, first.getR()));
    ASSERT_EQ(STATUS_OK, AParcel_readStrongBinder(p, second.getR()));
    EXPECT_EQ(binder.get(), first.get());
    EXPECT_EQ(binder.get(), second.get());
    // Reading again from the start gives the same object again.
    Rewind();
    ndk::SpAIBinder again;
    ASSERT_EQ(STATUS_OK, AParcel_readStrongBinder(p, again.getR()));
    EXPECT_EQ(binder.get(), again.get());
    ASSERT_EQ(STATUS_OK, AParcel_reset(p));
    EXPECT_EQ(4, AIBinder_debugGetRefCount(binder.get()));
    EXPECT_EQ(0, AParcel_getDataSize(p));
}

}  // namespace
}  // namespace vyr_test::binder
