// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// SampleRingReader on a ring that the service's writer fills with known boot times: the layout
// it checks, the newest record, one seq, and the records around and nearest a boot time, on an
// empty ring, at and beyond its edges, on ties and once the ring has wrapped.

#include <gtest/gtest.h>
#include <vyr/sample_ring_layout.h>
#include <vyr/sample_ring_reader.h>

#include <cstddef>
#include <cstdint>
#include <optional>

#include "ring_fixture.h"

namespace vyr_test::client {
namespace {

using vyr::RingSample;
using ReadResult = vyr::SampleRingReader::ReadResult;

// The seq of a record of the bracket, 0 when it is missing.
uint64_t SeqOf(const std::optional<RingSample>& sample) {
    return sample ? sample->seq : 0;
}

uint64_t NearestSeq(const vyr::SampleRingReader& reader, int64_t boottime_ns) {
    RingSample sample;
    return reader.Nearest(boottime_ns, &sample) ? sample.seq : 0;
}

// Samples 1..count at boot times 100, 200, ... ns.
void WriteEvery100(RingFixture* fixture, uint64_t count) {
    for (uint64_t seq = 1; seq <= count; ++seq) fixture->Write(static_cast<int64_t>(seq) * 100);
}

TEST(RingLayoutTest, VersionOneHasTheOffsetsReadersCompileAgainst) {
    EXPECT_EQ(offsetof(vyr_ring_header, magic), 0u);
    EXPECT_EQ(offsetof(vyr_ring_header, layout_version), 4u);
    EXPECT_EQ(offsetof(vyr_ring_header, header_size), 8u);
    EXPECT_EQ(offsetof(vyr_ring_header, record_size), 12u);
    EXPECT_EQ(offsetof(vyr_ring_header, capacity), 16u);
    EXPECT_EQ(offsetof(vyr_ring_header, mode), 20u);
    EXPECT_EQ(offsetof(vyr_ring_header, last_seq), 24u);
    // A futex word must be 4-byte aligned, and last_seq 8-byte aligned for its atomic loads.
    EXPECT_EQ(offsetof(vyr_ring_header, futex), 32u);
    EXPECT_EQ(offsetof(vyr_ring_record, sync), 0u);
    EXPECT_EQ(offsetof(vyr_ring_record, data_count), 4u);
    EXPECT_EQ(offsetof(vyr_ring_record, seq), 8u);
    EXPECT_EQ(offsetof(vyr_ring_record, boottime_ns), 16u);
    EXPECT_EQ(offsetof(vyr_ring_record, timestamp), 24u);
    EXPECT_EQ(offsetof(vyr_ring_record, status), 32u);
    EXPECT_EQ(offsetof(vyr_ring_record, value0), 36u);
    EXPECT_EQ(offsetof(vyr_ring_record, value1), 40u);
    EXPECT_EQ(offsetof(vyr_ring_record, data), 48u);
    EXPECT_EQ(sizeof(vyr_ring_record), 320u);
    // The record is copied 32 bits at a time under its lock.
    EXPECT_EQ(sizeof(vyr_ring_record) % sizeof(uint32_t), 0u);
    EXPECT_EQ(vyr_ring_bytes(VYR_RING_CAPACITY), 64u + VYR_RING_CAPACITY * 320u);
}

TEST(RingLayoutTest, TheServicesRingMapsWithItsModeAndCapacity) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    EXPECT_EQ(fixture.reader().mode(), 3);
    EXPECT_EQ(fixture.reader().capacity(), 8u);
    EXPECT_EQ(fixture.reader().LastSeq(), 0u);
}

TEST(RingReaderTest, AnEmptyRingHasNoSample) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    const vyr::SampleRingReader& reader = fixture.reader();
    RingSample sample;
    EXPECT_FALSE(reader.Latest(&sample));
    EXPECT_FALSE(reader.Nearest(0, &sample));
    EXPECT_EQ(reader.ReadSeq(1, &sample), ReadResult::kNotYetWritten);
    EXPECT_EQ(reader.ReadSeq(0, &sample), ReadResult::kOverwritten);
    const vyr::SampleRingReader::Bracket bracket = reader.Around(100);
    EXPECT_FALSE(bracket.before);
    EXPECT_FALSE(bracket.after);
}

TEST(RingReaderTest, LatestIsTheNewestWholeRecord) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    WriteEvery100(&fixture, 3);
    RingSample sample;
    ASSERT_TRUE(fixture.reader().Latest(&sample));
    EXPECT_EQ(sample.seq, 3u);
    EXPECT_EQ(sample.boottime_ns, 300);
    EXPECT_TRUE(IsWholeSample(sample));
    EXPECT_TRUE(SameEvent(sample.ToEvent(), EventOfSeq(3, 300)));
}

TEST(RingReaderTest, ReadSeqTellsWrittenFromNotYetWrittenAndOverwritten) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    WriteEvery100(&fixture, 20);
    const vyr::SampleRingReader& reader = fixture.reader();
    RingSample sample;
    for (uint64_t seq = 13; seq <= 20; ++seq) {
        ASSERT_EQ(reader.ReadSeq(seq, &sample), ReadResult::kOk) << seq;
        EXPECT_EQ(sample.seq, seq);
        EXPECT_EQ(sample.boottime_ns, static_cast<int64_t>(seq) * 100);
        EXPECT_TRUE(IsWholeSample(sample));
    }
    EXPECT_EQ(reader.ReadSeq(12, &sample), ReadResult::kOverwritten);
    EXPECT_EQ(reader.ReadSeq(1, &sample), ReadResult::kOverwritten);
    EXPECT_EQ(reader.ReadSeq(21, &sample), ReadResult::kNotYetWritten);
}

TEST(RingReaderTest, AroundBracketsATimeWithTheRecordsOnEitherSide) {
    RingFixture fixture(16);
    ASSERT_TRUE(fixture.ready());
    WriteEvery100(&fixture, 10);
    const vyr::SampleRingReader& reader = fixture.reader();
    // Between two records.
    vyr::SampleRingReader::Bracket bracket = reader.Around(250);
    EXPECT_EQ(SeqOf(bracket.before), 2u);
    EXPECT_EQ(SeqOf(bracket.after), 3u);
    EXPECT_TRUE(IsWholeSample(*bracket.before));
    EXPECT_TRUE(IsWholeSample(*bracket.after));
    // An exact hit is at or before the time.
    bracket = reader.Around(300);
    EXPECT_EQ(SeqOf(bracket.before), 3u);
    EXPECT_EQ(SeqOf(bracket.after), 4u);
    // Before the first record and at the last.
    bracket = reader.Around(99);
    EXPECT_EQ(SeqOf(bracket.before), 0u);
    EXPECT_EQ(SeqOf(bracket.after), 1u);
    bracket = reader.Around(100);
    EXPECT_EQ(SeqOf(bracket.before), 1u);
    EXPECT_EQ(SeqOf(bracket.after), 2u);
    bracket = reader.Around(1000);
    EXPECT_EQ(SeqOf(bracket.before), 10u);
    EXPECT_EQ(SeqOf(bracket.after), 0u);
    bracket = reader.Around(5000);
    EXPECT_EQ(SeqOf(bracket.before), 10u);
    EXPECT_EQ(SeqOf(bracket.after), 0u);
}

TEST(RingReaderTest, AroundARepeatedBootTimeTakesTheLastOfItsRecords) {
    RingFixture fixture(16);
    ASSERT_TRUE(fixture.ready());
    for (int64_t boottime : {100, 200, 200, 200, 300}) fixture.Write(boottime);
    const vyr::SampleRingReader::Bracket bracket = fixture.reader().Around(200);
    EXPECT_EQ(SeqOf(bracket.before), 4u);
    EXPECT_EQ(SeqOf(bracket.after), 5u);
    EXPECT_EQ(NearestSeq(fixture.reader(), 200), 4u);
    EXPECT_EQ(NearestSeq(fixture.reader(), 199), 2u);
}

TEST(RingReaderTest, NearestTakesTheCloserRecordAndTheEarlierOfATie) {
    RingFixture fixture(16);
    ASSERT_TRUE(fixture.ready());
    WriteEvery100(&fixture, 10);
    const vyr::SampleRingReader& reader = fixture.reader();
    EXPECT_EQ(NearestSeq(reader, 240), 2u);
    EXPECT_EQ(NearestSeq(reader, 260), 3u);
    EXPECT_EQ(NearestSeq(reader, 250), 2u);
    EXPECT_EQ(NearestSeq(reader, 300), 3u);
    EXPECT_EQ(NearestSeq(reader, -5000), 1u);
    EXPECT_EQ(NearestSeq(reader, 1049), 10u);
    // The distances of times far apart are taken without overflow.
    EXPECT_EQ(NearestSeq(reader, INT64_MIN), 1u);
    EXPECT_EQ(NearestSeq(reader, INT64_MAX), 10u);
}

TEST(RingReaderTest, AWrappedRingIsSearchedOverTheRecordsLeft) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    WriteEvery100(&fixture, 20);  // seqs 13..20 are left, boot times 1300..2000.
    const vyr::SampleRingReader& reader = fixture.reader();
    // Older records were overwritten: nothing is known before the oldest left.
    vyr::SampleRingReader::Bracket bracket = reader.Around(500);
    EXPECT_EQ(SeqOf(bracket.before), 0u);
    EXPECT_EQ(SeqOf(bracket.after), 13u);
    bracket = reader.Around(1300);
    EXPECT_EQ(SeqOf(bracket.before), 13u);
    EXPECT_EQ(SeqOf(bracket.after), 14u);
    bracket = reader.Around(1650);
    EXPECT_EQ(SeqOf(bracket.before), 16u);
    EXPECT_EQ(SeqOf(bracket.after), 17u);
    bracket = reader.Around(2000);
    EXPECT_EQ(SeqOf(bracket.before), 20u);
    EXPECT_EQ(SeqOf(bracket.after), 0u);
    EXPECT_EQ(NearestSeq(reader, 500), 13u);
    EXPECT_EQ(NearestSeq(reader, 1650), 16u);
    EXPECT_EQ(NearestSeq(reader, 1651), 17u);
    // Every record left is found at its own boot time, wherever it sits in the memory.
    for (uint64_t seq = 13; seq <= 20; ++seq) {
        EXPECT_EQ(NearestSeq(reader, static_cast<int64_t>(seq) * 100), seq);
    }
}

TEST(RingReaderTest, DataBeyondTheRecordIsCutToItsCapacity) {
    RingFixture fixture(4);
    ASSERT_TRUE(fixture.ready());
    aidl::android::vyr::Event event = EventOfSeq(1, 100);
    event.data.assign(VYR_RING_DATA_CAPACITY + 10, 1.5f);
    fixture.ring().Write(event);
    RingSample sample;
    ASSERT_TRUE(fixture.reader().Latest(&sample));
    EXPECT_EQ(sample.data_count, VYR_RING_DATA_CAPACITY);
    EXPECT_EQ(sample.ToEvent().data, std::vector<float>(VYR_RING_DATA_CAPACITY, 1.5f));
}

}  // namespace
}  // namespace vyr_test::client
