// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The sample ring of interface version 3: shared memory that vyrservice writes each valid
// sample of one sensor mode into, and that clients map read-only (IVYRService.EnableRing).
// This header is the ring's ABI, layout version 1. It is C as well as C++, so that any reader
// can include it; readers in C++ normally use vyr/sample_ring_reader.h instead.
//
// Memory: a vyr_ring_header at offset 0, then `capacity` records of `record_size` bytes from
// offset `header_size`. All fields are little-endian as the device is; a reader checks magic,
// layout_version, header_size and record_size against this header before it reads anything,
// and checks that the mapping holds header_size + capacity * record_size bytes.
//
// Sequence numbers: the n-th sample written since the service started has seq n (from 1), and
// is at record index n % capacity. header.last_seq is the newest seq written (0: none yet), so
// the records of seqs last_seq - capacity + 1 .. last_seq are the ones a reader can find. A ring
// is written only while a client is enabled on it, so its seqs may pause but never restart.
// boottime_ns of successive seqs never decreases.
//
// Torn records: each record is guarded by its own sequence lock, `sync`. The one writer makes
// it odd, stores the fields (release), then makes it even again (release). A reader loads sync
// (acquire), copies the record (acquire) if sync is even and loads sync again: the copy is
// whole only if both loads are equal, since a reader that loads a field of a newer write also
// sees that write's odd sync. (Release stores and acquire loads of the fields order as a fence
// on each side would, and ThreadSanitizer can check them.) vyr_ring_read_record does exactly
// that; then the copy's seq tells whether it is the record asked for (a record overwritten by
// a newer lap has a larger seq). Every shared word is read and written with atomic operations,
// 32 bits at a time in records, so readers and the writer never race in the language's sense.
//
// Waiting: after each record the writer stores last_seq (release), then `futex` (the low 32
// bits of last_seq, release), and wakes one waiter on `futex` (FUTEX_WAKE of 1, not private:
// the memory is shared between processes). A reader that has seen seq s loads futex, checks
// that last_seq is still s, and sleeps with FUTEX_WAIT(futex, the loaded value). A reader woken
// from that sleep (the call returned 0) that finds futex changed wakes every other waiter
// (FUTEX_WAKE of INT_MAX; a wake needs no write access), so that the writer's cost stays one
// wake-up however many readers wait, and the readers share the rest. The writer never waits for
// a reader, and a reader that never reads costs the writer nothing. A reader killed between its
// wake-up and its own wake leaves the others asleep until the next record or their deadline.

#ifndef VYR_SAMPLE_RING_LAYOUT_H
#define VYR_SAMPLE_RING_LAYOUT_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#define VYR_RING_MAGIC 0x52525956u  // "VYRR"
#define VYR_RING_LAYOUT_VERSION 1u
// Records in a ring: one second at the shortest period, 1 ms, with room to spare.
#define VYR_RING_CAPACITY 1024u
// Floats a record holds: the range mode's 10 + 11 x 4 zones, and more than the light mode's 5.
#define VYR_RING_DATA_CAPACITY 64u

struct vyr_ring_header {
    uint32_t magic;           // VYR_RING_MAGIC
    uint32_t layout_version;  // VYR_RING_LAYOUT_VERSION
    uint32_t header_size;     // offset of record 0: sizeof(struct vyr_ring_header)
    uint32_t record_size;     // sizeof(struct vyr_ring_record)
    uint32_t capacity;        // records in the ring
    int32_t mode;             // the sensor mode: 1 light, 3 range
    uint64_t last_seq;        // newest seq written, 0 before the first; atomic
    uint32_t futex;           // low 32 bits of last_seq, the word readers sleep on; atomic
    uint32_t reserved[7];
};

// One sample: seq, the CLOCK_BOOTTIME time of the reading (Event.boottime), and every other
// field of android.vyr.Event, `data` cut to data_count values.
struct vyr_ring_record {
    uint32_t sync;        // the record's sequence lock: odd while it is being written
    uint32_t data_count;  // values in data, at most VYR_RING_DATA_CAPACITY
    uint64_t seq;
    int64_t boottime_ns;  // Event.boottime
    int64_t timestamp;    // Event.timestamp
    int32_t status;       // Event.status
    float value0;         // Event.value0
    float value1;         // Event.value1
    uint32_t reserved0;
    float data[VYR_RING_DATA_CAPACITY];  // Event.data
    uint32_t reserved1[4];
};

#ifdef __cplusplus
static_assert(sizeof(vyr_ring_header) == 64, "layout version 1");
static_assert(offsetof(vyr_ring_header, last_seq) == 24, "layout version 1");
static_assert(offsetof(vyr_ring_header, futex) == 32, "layout version 1");
static_assert(sizeof(vyr_ring_record) == 320, "layout version 1");
static_assert(offsetof(vyr_ring_record, seq) == 8, "layout version 1");
static_assert(offsetof(vyr_ring_record, data) == 48, "layout version 1");
#else
_Static_assert(sizeof(struct vyr_ring_header) == 64, "layout version 1");
_Static_assert(sizeof(struct vyr_ring_record) == 320, "layout version 1");
#endif

// Bytes the memory of a ring of `capacity` records holds at least.
static inline size_t vyr_ring_bytes(uint32_t capacity) {
    return sizeof(struct vyr_ring_header) + (size_t)capacity * sizeof(struct vyr_ring_record);
}

// The record that holds `seq`.
static inline struct vyr_ring_record* vyr_ring_slot(const struct vyr_ring_header* header,
                                                    uint64_t seq) {
    return (struct vyr_ring_record*)((const char*)header + header->header_size +
                                     (size_t)(seq % header->capacity) * header->record_size);
}

static inline uint64_t vyr_ring_last_seq(const struct vyr_ring_header* header) {
    return __atomic_load_n(&header->last_seq, __ATOMIC_ACQUIRE);
}

// Copies `record` into `out` under its sequence lock: 1 when the copy is whole, 0 when the
// writer was inside the record (read again). The caller then checks out->seq.
static inline int vyr_ring_read_record(const struct vyr_ring_record* record,
                                       struct vyr_ring_record* out) {
    const uint32_t* from = (const uint32_t*)record;
    uint32_t* to = (uint32_t*)out;
    const uint32_t before = __atomic_load_n(&record->sync, __ATOMIC_ACQUIRE);
    if (before & 1u) return 0;
    for (size_t i = 0; i < sizeof(*record) / sizeof(uint32_t); ++i) {
        to[i] = __atomic_load_n(&from[i], __ATOMIC_ACQUIRE);
    }
    return __atomic_load_n(&record->sync, __ATOMIC_RELAXED) == before;
}

// The writer's side: stores `in` (its sync ignored) as the record of in->seq, then publishes
// it. Only one thread may write a ring.
static inline void vyr_ring_write_record(struct vyr_ring_header* header,
                                         const struct vyr_ring_record* in) {
    struct vyr_ring_record* record = vyr_ring_slot(header, in->seq);
    const uint32_t* from = (const uint32_t*)in;
    uint32_t* to = (uint32_t*)record;
    const uint32_t sync = __atomic_load_n(&record->sync, __ATOMIC_RELAXED);
    __atomic_store_n(&record->sync, sync + 1u, __ATOMIC_RELAXED);
    for (size_t i = 1; i < sizeof(*record) / sizeof(uint32_t); ++i) {
        __atomic_store_n(&to[i], from[i], __ATOMIC_RELEASE);
    }
    __atomic_store_n(&record->sync, sync + 2u, __ATOMIC_RELEASE);
    __atomic_store_n(&header->last_seq, in->seq, __ATOMIC_RELEASE);
    __atomic_store_n(&header->futex, (uint32_t)in->seq, __ATOMIC_RELEASE);
}

#ifdef __cplusplus
}
#endif

#endif  // VYR_SAMPLE_RING_LAYOUT_H
