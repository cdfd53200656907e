// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// No torn record: a writer process fills a small ring as fast as it can for a second, with
// samples whose every field derives from their seq, while this process reads the newest record
// and the oldest ones (those the writer overwrites next) over and over. Every record a read
// returns must be whole.

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>

#include "ring_fixture.h"

namespace vyr_test::client {
namespace {

using std::chrono::steady_clock;
using vyr::RingSample;
using ReadResult = vyr::SampleRingReader::ReadResult;

constexpr std::chrono::seconds kWriting{1};
constexpr std::chrono::seconds kWriterEnds{30};
// Small, so that the writer laps it thousands of times while the reader is inside a record.
constexpr uint32_t kCapacity = 16;

int64_t BootTimeOf(uint64_t seq) {
    return static_cast<int64_t>(seq) * 1000 + 17;
}

// Checks one record read; counts it as bad (reporting the first few) when it is not whole.
class RecordCheck {
  public:
    void Check(const RingSample& sample, uint64_t wanted_seq) {
        ++read_;
        ::testing::AssertionResult whole = IsWholeSample(sample);
        if (whole && sample.boottime_ns != BootTimeOf(sample.seq)) {
            whole = ::testing::AssertionFailure()
                    << "sample " << sample.seq << " has boot time " << sample.boottime_ns;
        }
        if (whole && wanted_seq != 0 && sample.seq != wanted_seq) {
            whole = ::testing::AssertionFailure()
                    << "asked for seq " << wanted_seq << ", got " << sample.seq;
        }
        if (!whole && ++bad_ <= 5) ADD_FAILURE() << whole.message();
    }
    uint64_t read() const { return read_; }
    uint64_t bad() const { return bad_; }

  private:
    uint64_t read_ = 0;
    uint64_t bad_ = 0;
};

TEST(RingTornRecordTest, EveryRecordReadWhileAnotherProcessWritesIsWhole) {
    RingFixture fixture(kCapacity);
    ASSERT_TRUE(fixture.ready());
    const pid_t writer = fork();
    ASSERT_GE(writer, 0);
    if (writer == 0) {
        const auto end = steady_clock::now() + kWriting;
        while (steady_clock::now() < end) {
            for (int i = 0; i < 64; ++i) {
                const uint64_t seq = fixture.ring().last_seq() + 1;
                fixture.ring().Write(EventOfSeq(seq, BootTimeOf(seq)));
            }
        }
        _exit(0);
    }

    const vyr::SampleRingReader& reader = fixture.reader();
    RecordCheck check;
    uint64_t overwritten = 0;
    int status = 0;
    const auto give_up = steady_clock::now() + kWriterEnds;
    while (waitpid(writer, &status, WNOHANG) == 0 && steady_clock::now() < give_up) {
        RingSample sample;
        if (reader.Latest(&sample)) check.Check(sample, 0);
        const uint64_t last = reader.LastSeq();
        for (uint64_t seq = last > kCapacity ? last - kCapacity + 1 : 1; seq <= last; ++seq) {
            const ReadResult result = reader.ReadSeq(seq, &sample);
            if (result == ReadResult::kOk) {
                check.Check(sample, seq);
            } else if (result == ReadResult::kOverwritten) {
                ++overwritten;
            } else {
                ADD_FAILURE() << "seq " << seq << " of " << last << " is not yet written";
            }
        }
    }
    if (steady_clock::now() >= give_up) {
        kill(writer, SIGKILL);
        waitpid(writer, &status, 0);
        FAIL() << "the writer did not end";
    }
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
    EXPECT_EQ(check.bad(), 0u) << "of " << check.read() << " records read";
    EXPECT_GT(check.read(), 1000u);
    // Evidence that the reads raced the writer: some records went while they were being read.
    EXPECT_GT(overwritten, 0u);
    EXPECT_GT(reader.LastSeq(), 10u * kCapacity);
}

}  // namespace
}  // namespace vyr_test::client
