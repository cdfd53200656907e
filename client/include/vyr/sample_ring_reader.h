// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The reading side of a sample ring (interface version 3): the descriptor that
// IVYRService.EnableRing hands over, mapped read-only, and the reading protocol of
// vyr/sample_ring_layout.h behind calls that find a sample by its seq or its boot time, or wait
// for the next one.
//
//   ndk::ScopedFileDescriptor ring;
//   int32_t result = 0;
//   service->EnableRing(handle, period_ms, &ring, &result);
//   std::string error;
//   std::unique_ptr<vyr::SampleRingReader> reader =
//       vyr::SampleRingReader::Map(std::move(ring), &error);
//   vyr::RingSample sample;
//   if (reader != nullptr && reader->Nearest(frame_boottime_ns, &sample)) { ... }
//
// Threads: every call but Map and the destructor is const and lock-free, and only reads the
// shared memory (the service never waits for a reader, nor a reader for another). Any number of
// threads may call them on one reader at once, WaitNewer included; the reader must outlive
// those calls. The service's writes go on meanwhile: a call sees the ring as it was at some
// moment during the call, and a sample it returns is a whole record, never a mix of two.
//
// The mapping stays readable after the handle is disabled or closed and after the service's
// death; the ring is then no longer written, and WaitNewer waits until its deadline.

#include <android/binder_auto_utils.h>
#include <vyr/ring_sample.h>
#include <vyr/sample_ring_layout.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace vyr {

class SampleRingReader {
  public:
    enum class ReadResult {
        kOk,
        // Newer than the newest record: the service has not written it yet.
        kNotYetWritten,
        // Older than the oldest record left: the service wrote a newer sample in its place (seq
        // 0, before the first sample, counts as such).
        kOverwritten,
    };

    enum class WaitResult {
        kOk,
        // The deadline passed with no newer record.
        kTimedOut,
        // A signal handler ran in this thread before a newer record came.
        kInterrupted,
        // The wait itself failed; errno says why.
        kFailed,
    };

    // The records on either side of a boot time. Either may be missing: `before` when the time
    // is earlier than every record left (older ones were overwritten, or none was written yet),
    // `after` when no record is later than it yet.
    struct Bracket {
        // The newest record whose boottime_ns is at or before the time.
        std::optional<RingSample> before;
        // The oldest record whose boottime_ns is after the time.
        std::optional<RingSample> after;
    };

    // Maps the ring behind `fd` read-only and checks its header against this layout (magic,
    // version, header and record sizes, capacity) and its size against the header. Null with
    // `*error` set when `fd` is no ring, another layout, or too small for what its header says;
    // the descriptor is closed either way (the mapping does not need it).
    static std::unique_ptr<SampleRingReader> Map(ndk::ScopedFileDescriptor fd, std::string* error);
    ~SampleRingReader();
    SampleRingReader(const SampleRingReader&) = delete;
    SampleRingReader& operator=(const SampleRingReader&) = delete;

    // The sensor mode the ring is of: 1 light, 3 range.
    int32_t mode() const { return mode_; }
    uint32_t capacity() const { return capacity_; }
    // The newest seq written, 0 before the first sample.
    uint64_t LastSeq() const { return vyr_ring_last_seq(header_); }

    // The newest record; false when none was written yet.
    bool Latest(RingSample* out) const;
    // The record of `seq`; `out` is set only with kOk.
    ReadResult ReadSeq(uint64_t seq, RingSample* out) const;
    // The record whose boottime_ns is nearest `boottime_ns`, the earlier of two as near; false
    // when the ring holds none.
    bool Nearest(int64_t boottime_ns, RingSample* out) const;
    // The records on either side of `boottime_ns`, by a binary search over the records left
    // (boot times never decrease along the seqs).
    Bracket Around(int64_t boottime_ns) const;
    // The first record newer than `seq` that is still in the ring: seq + 1, or the oldest one
    // left when the service has overwritten seq + 1 already (out->seq - seq - 1 records were
    // missed). Sleeps on the ring's futex word until the service writes one or `deadline`
    // passes; steady_clock is CLOCK_MONOTONIC, the clock of the futex's absolute deadline.
    WaitResult WaitNewer(uint64_t seq, std::chrono::steady_clock::time_point deadline,
                         RingSample* out) const;

  private:
    SampleRingReader(const void* address, size_t size) : address_(address), size_(size) {}

    // Checks the mapped header; false with `*error` set when it is not a ring of this layout.
    bool CheckHeader(std::string* error);
    // The oldest seq whose record can still be in the ring when `last` is the newest.
    uint64_t OldestSeq(uint64_t last) const;
    const vyr_ring_record* Slot(uint64_t seq) const;
    // One binary search over the records as they are when it starts; false when a record it
    // probed was overwritten meanwhile, so that the window moved under it.
    bool SearchAround(int64_t boottime_ns, Bracket* bracket) const;

    const void* address_;
    size_t size_;
    const vyr_ring_header* header_ = nullptr;
    const char* records_ = nullptr;
    // Copied from the header when it was checked, so that the bounds of every read are the
    // ones checked against the mapping's size.
    uint32_t capacity_ = 0;
    int32_t mode_ = 0;
};

}  // namespace vyr
