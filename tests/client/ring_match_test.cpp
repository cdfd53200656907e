// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Frame matching on a ring that holds a recorded scene with the service's boot times: Nearest
// and Around answer what a scan of the recording finds, for boot times spread over the scene and
// a little beyond it (the look-ups that bench_ring_match times), and at and between its samples,
// where ties fall.

#include <gtest/gtest.h>
#include <vyr/ring_sample.h>
#include <vyr/sample_ring_reader.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "recording_ring.h"

namespace vyr_test::client {
namespace {

using vyr_bench::RecordingRing;

// Every answer for `times`, each checked against the scan.
void ExpectMatchedAsScanned(const RecordingRing& ring, const std::vector<int64_t>& times) {
    for (int64_t time : times) {
        vyr::RingSample nearest;
        ASSERT_TRUE(ring.reader().Nearest(time, &nearest)) << time;
        EXPECT_TRUE(ring.NearestIsRight(time, nearest))
            << "Nearest(" << time << ") gave seq " << nearest.seq << " at " << nearest.boottime_ns;
        EXPECT_TRUE(ring.AroundIsRight(time, ring.reader().Around(time)))
            << "Around(" << time << ")";
    }
}

class RingMatchTest : public ::testing::Test {
  protected:
    void SetUp() override {
        std::string error;
        ring_ = RecordingRing::Load(VYR_MATCH_RECORDING, &error);
        ASSERT_NE(ring_, nullptr) << error;
    }

    std::unique_ptr<RecordingRing> ring_;
};

TEST_F(RingMatchTest, RandomTimesOverTheSceneAreMatchedAsAScanMatchesThem) {
    ExpectMatchedAsScanned(*ring_, ring_->LookupTimes(1000, 1));
}

TEST_F(RingMatchTest, EachSampleAndTheTimesHalfwayToTheNextAreMatchedAsAScanMatchesThem) {
    std::vector<int64_t> times;
    int64_t previous = 0;
    for (uint64_t seq = 1; seq <= ring_->size(); ++seq) {
        vyr::RingSample sample;
        ASSERT_EQ(ring_->reader().ReadSeq(seq, &sample), vyr::SampleRingReader::ReadResult::kOk);
        if (seq > 1) {
            // Halfway down, and up: one of the two is a tie between the neighbours when their
            // distance is even, which goes to the earlier.
            const int64_t halfway = previous + (sample.boottime_ns - previous) / 2;
            times.push_back(halfway);
            times.push_back(halfway + 1);
        }
        times.push_back(sample.boottime_ns);
        previous = sample.boottime_ns;
    }
    ExpectMatchedAsScanned(*ring_, times);
}

}  // namespace
}  // namespace vyr_test::client
