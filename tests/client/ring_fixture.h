// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// A sample ring written by the service's own writer (SampleRing), read through a
// SampleRingReader of the descriptor that the service hands its clients; and samples whose every
// field derives from their seq, so that a reader can tell a whole record from a torn one.

#include <aidl/android/vyr/Event.h>
#include <android/binder_auto_utils.h>
#include <gtest/gtest.h>
#include <vyr/ring_sample.h>
#include <vyr/sample_ring_reader.h>

#include <cstdint>
#include <memory>

#include "sample_ring.h"

namespace vyr_test::client {

// The event that the test writes as sample `seq`: every field but the boot time derives from
// the seq; its data has 1 to VYR_RING_DATA_CAPACITY values.
aidl::android::vyr::Event EventOfSeq(uint64_t seq, int64_t boottime_ns);
// Success when `sample` is exactly what EventOfSeq(sample.seq, ...) wrote, the boot time aside.
::testing::AssertionResult IsWholeSample(const vyr::RingSample& sample);
// Field by field (the generated parcelable has no operator==).
bool SameEvent(const aidl::android::vyr::Event& a, const aidl::android::vyr::Event& b);

class RingFixture {
  public:
    // A ring of `capacity` records of the range mode, none written, and a reader of it.
    explicit RingFixture(uint32_t capacity);
    // False (a failure added) when the ring could not be made or mapped.
    bool ready() const { return reader_ != nullptr; }

    android::vyr::binder::SampleRing& ring() { return *ring_; }
    const vyr::SampleRingReader& reader() const { return *reader_; }
    // Another client's descriptor of the ring.
    ndk::ScopedFileDescriptor ClientFd() const { return ring_->ReaderFd(); }

    // Writes the next sample (EventOfSeq) at `boottime_ns`; returns its seq.
    uint64_t Write(int64_t boottime_ns);

  private:
    std::unique_ptr<android::vyr::binder::SampleRing> ring_;
    std::unique_ptr<vyr::SampleRingReader> reader_;
};

}  // namespace vyr_test::client
