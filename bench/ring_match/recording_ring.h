// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// A recording (`vyrctl stream --json` lines) written into a sample ring by the service's own
// writer and mapped by a client's SampleRingReader, with the answers that a scan of the
// recording gives for a boot time: what frame matching is timed and checked on, by
// bench_ring_match and by the client suite alike.

#include <aidl/android/vyr/Event.h>
#include <vyr/ring_sample.h>
#include <vyr/sample_ring_reader.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace vyr_bench {

class RecordingRing {
  public:
    // The samples of the recording at `path` (the last VYR_RING_CAPACITY of them if it holds
    // more) written in order into a ring of VYR_RING_CAPACITY records, which a reader maps from
    // the writer's client descriptor. Null with `*error` set when the file cannot be read, a line
    // is no sample with a boot time, the boot times decrease, or the ring cannot be made or
    // mapped.
    static std::unique_ptr<RecordingRing> Load(const std::string& path, std::string* error);

    const vyr::SampleRingReader& reader() const { return *reader_; }
    // Samples in the ring.
    size_t size() const { return samples_.size(); }

    // `count` boot times from a generator seeded with `seed`, spread evenly over the recording's
    // span and a tenth of it beyond either end, where a look-up finds only the first or the last.
    std::vector<int64_t> LookupTimes(size_t count, uint64_t seed) const;

    // Whether `answer` is the sample that a scan of the recording finds nearest `boottime_ns`,
    // the earlier of two as near, copied whole from its place in the ring.
    bool NearestIsRight(int64_t boottime_ns, const vyr::RingSample& answer) const;
    // Whether `bracket` holds the newest sample at or before `boottime_ns` and the oldest after
    // it, as a scan of the recording finds them.
    bool AroundIsRight(int64_t boottime_ns, const vyr::SampleRingReader::Bracket& bracket) const;

  private:
    RecordingRing(std::vector<aidl::android::vyr::Event> samples,
                  std::unique_ptr<vyr::SampleRingReader> reader)
        : samples_(std::move(samples)), reader_(std::move(reader)) {}

    // Whether `answer` is, field by field, the recording's sample of its seq.
    bool IsRecorded(const vyr::RingSample& answer) const;

    // The samples written, sample i as seq i + 1.
    std::vector<aidl::android::vyr::Event> samples_;
    std::unique_ptr<vyr::SampleRingReader> reader_;
};

}  // namespace vyr_bench
