// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "ring_fixture.h"

#include <sstream>
#include <string>

namespace vyr_test::client {

namespace {

constexpr int32_t kRangeMode = 3;

// Floats hold whole numbers exactly below 2^24: every derived value stays below it.
float Derived(uint64_t seq, uint32_t salt) {
    return static_cast<float>((seq * 31 + salt) % (1u << 20));
}

uint32_t DataCount(uint64_t seq) {
    return 1 + static_cast<uint32_t>(seq % VYR_RING_DATA_CAPACITY);
}

std::string Describe(const aidl::android::vyr::Event& event) {
    std::ostringstream text;
    text << "{status " << event.status << ", timestamp " << event.timestamp << ", values "
         << event.value0 << " " << event.value1 << ", " << event.data.size() << " data from "
         << (event.data.empty() ? 0.0f : event.data.front()) << ", boottime " << event.boottime
         << "}";
    return text.str();
}

}  // namespace

aidl::android::vyr::Event EventOfSeq(uint64_t seq, int64_t boottime_ns) {
    aidl::android::vyr::Event event;
    event.status = static_cast<int32_t>(seq % 251);
    event.timestamp = static_cast<int64_t>(seq * 7);
    event.value0 = Derived(seq, 1000);
    event.value1 = Derived(seq, 2000);
    for (uint32_t i = 0; i < DataCount(seq); ++i) event.data.push_back(Derived(seq, i));
    event.boottime = boottime_ns;
    return event;
}

::testing::AssertionResult IsWholeSample(const vyr::RingSample& sample) {
    const aidl::android::vyr::Event expected = EventOfSeq(sample.seq, sample.boottime_ns);
    const aidl::android::vyr::Event got = sample.ToEvent();
    if (!SameEvent(got, expected)) {
        return ::testing::AssertionFailure()
               << "sample " << sample.seq << " is not the one "
               << "written: " << Describe(got) << " instead of " << Describe(expected);
    }
    for (size_t i = sample.data_count; i < sample.data.size(); ++i) {
        if (sample.data[i] != 0) {
            return ::testing::AssertionFailure()
                   << "sample " << sample.seq << " has value " << sample.data[i] << " at " << i
                   << ", past its " << sample.data_count << " values";
        }
    }
    return ::testing::AssertionSuccess();
}

bool SameEvent(const aidl::android::vyr::Event& a, const aidl::android::vyr::Event& b) {
    return a.status == b.status && a.timestamp == b.timestamp && a.value0 == b.value0 &&
           a.value1 == b.value1 && a.data == b.data && a.boottime == b.boottime;
}

RingFixture::RingFixture(uint32_t capacity) {
    std::string error;
    ring_ = android::vyr::binder::SampleRing::Create(kRangeMode, capacity, &error);
    if (ring_ == nullptr) {
        ADD_FAILURE() << "cannot make a ring: " << error;
        return;
    }
    reader_ = vyr::SampleRingReader::Map(ring_->ReaderFd(), &error);
    if (reader_ == nullptr) ADD_FAILURE() << "cannot map the ring: " << error;
}

uint64_t RingFixture::Write(int64_t boottime_ns) {
    const uint64_t seq = ring_->last_seq() + 1;
    ring_->Write(EventOfSeq(seq, boottime_ns));
    return seq;
}

}  // namespace vyr_test::client
