// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Frame matching on a sample ring: a recording with the service's boot times written into a
// ring by the service's writer, mapped by a client's SampleRingReader, and asked Nearest and
// Around for random boot times (a fixed seed) over the recording's span and a little beyond; each
// answer checked against a scan of the recording, and the look-ups timed.
//
//   bench_ring_match [--recording FILE] [--lookups N]
//
// Prints "N/N right (Around N/N), X us per look-up (Around Y us; S samples)"; exits 1 on a wrong
// answer.
#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "flags.h"
#include "recording_ring.h"

namespace {

using std::chrono::steady_clock;

// Fixed, so that every run asks for the same boot times.
constexpr uint64_t kSeed = 20260101;
// A look-up takes about a microsecond: the times are looked up this many times over, so that the
// clock's reads and the caches of the first pass weigh little.
constexpr int kTimedPasses = 100;

template <typename LookUp>
double MicrosecondsPerLookUp(const std::vector<int64_t>& times, LookUp look_up) {
    const steady_clock::time_point start = steady_clock::now();
    for (int pass = 0; pass < kTimedPasses; ++pass) {
        for (int64_t time : times) look_up(time);
    }
    const std::chrono::duration<double, std::micro> spent = steady_clock::now() - start;
    return spent.count() / (static_cast<double>(times.size()) * kTimedPasses);
}

}  // namespace

int main(int argc, char** argv) {
    std::string recording = VYR_MATCH_RECORDING;
    int lookups = 1000;
    if (!vyr_bench::ParseFlags(argc, argv, {{"--recording", &recording}, {"--lookups", &lookups}}))
        return 2;
    if (lookups < 1) {
        fprintf(stderr, "usage: bench_ring_match [--recording FILE] [--lookups N]\n");
        return 2;
    }
    std::string error;
    std::unique_ptr<vyr_bench::RecordingRing> ring =
        vyr_bench::RecordingRing::Load(recording, &error);
    if (ring == nullptr) {
        fprintf(stderr, "bench_ring_match: %s\n", error.c_str());
        return 1;
    }
    const vyr::SampleRingReader& reader = ring->reader();
    const std::vector<int64_t> times = ring->LookupTimes(static_cast<size_t>(lookups), kSeed);

    int nearest_right = 0;
    int around_right = 0;
    for (int64_t time : times) {
        vyr::RingSample nearest;
        if (reader.Nearest(time, &nearest) && ring->NearestIsRight(time, nearest)) ++nearest_right;
        if (ring->AroundIsRight(time, reader.Around(time))) ++around_right;
    }
    // The answers are kept from the optimiser, which could otherwise drop the look-ups.
    const double nearest_us = MicrosecondsPerLookUp(times, [&reader](int64_t time) {
        vyr::RingSample sample;
        bool found = reader.Nearest(time, &sample);
        benchmark::DoNotOptimize(found);
        benchmark::DoNotOptimize(sample);
    });
    const double around_us = MicrosecondsPerLookUp(times, [&reader](int64_t time) {
        vyr::SampleRingReader::Bracket bracket = reader.Around(time);
        benchmark::DoNotOptimize(bracket);
    });
    printf("%d/%d right (Around %d/%d), %.2f us per look-up (Around %.2f us; %zu samples)\n",
           nearest_right, lookups, around_right, lookups, nearest_us, around_us, ring->size());
    return nearest_right == lookups && around_right == lookups ? 0 : 1;
}
