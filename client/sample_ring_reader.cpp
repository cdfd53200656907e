// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "vyr/sample_ring_reader.h"

#include <linux/futex.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cinttypes>
#include <climits>
#include <cstdio>
#include <cstring>
#include <limits>

#ifdef __ANDROID__
#include <cutils/ashmem.h>
#endif

namespace vyr {

namespace {

std::string Failed(const char* what) {
    return std::string(what) + ": " + strerror(errno);
}

// The size of the memory behind `fd`; false with `*error` set when it has none.
bool MemorySize(int fd, size_t* size, std::string* error) {
#ifdef __ANDROID__
    // The service makes the ring with libcutils' ashmem: a memfd on current devices, a
    // /dev/ashmem region (a character device, whose st_size is 0) on older ones. libcutils
    // asks whichever it is.
    const int bytes = ashmem_get_size_region(fd);
    if (bytes < 0) {
        *error = Failed("not shared memory (ashmem_get_size_region)");
        return false;
    }
    *size = static_cast<size_t>(bytes);
#else
    struct stat st {};
    if (fstat(fd, &st) != 0) {
        *error = Failed("fstat");
        return false;
    }
    // A memfd is a regular file; a pipe, socket or device holds no memory to map.
    if (!S_ISREG(st.st_mode)) {
        *error = "not shared memory (file type 0" + std::to_string(st.st_mode & S_IFMT) + ")";
        return false;
    }
    if (static_cast<uintmax_t>(st.st_size) > std::numeric_limits<size_t>::max()) {
        *error = "too large to map: " + std::to_string(st.st_size) + " bytes";
        return false;
    }
    *size = static_cast<size_t>(st.st_size);
#endif
    return true;
}

RingSample ToSample(const vyr_ring_record& record) {
    RingSample sample;
    sample.seq = record.seq;
    sample.boottime_ns = record.boottime_ns;
    sample.timestamp = record.timestamp;
    sample.status = record.status;
    sample.value0 = record.value0;
    sample.value1 = record.value1;
    // The count comes from another process: never past the array, whatever it says.
    sample.data_count = std::min<uint32_t>(record.data_count, VYR_RING_DATA_CAPACITY);
    std::copy_n(record.data, sample.data_count, sample.data.begin());
    return sample;
}

// The bytes a ring of `capacity` records needs, without the overflow of a 32-bit size_t.
uint64_t RingBytes(uint32_t capacity) {
    return sizeof(vyr_ring_header) + uint64_t{capacity} * sizeof(vyr_ring_record);
}

// |a - b| without overflow, for a >= b.
uint64_t Distance(int64_t a, int64_t b) {
    return static_cast<uint64_t>(a) - static_cast<uint64_t>(b);
}

timespec MonotonicTimespec(std::chrono::steady_clock::time_point when) {
    const int64_t ns =
        std::chrono::duration_cast<std::chrono::nanoseconds>(when.time_since_epoch()).count();
    timespec ts{};
    ts.tv_sec = static_cast<time_t>(ns / 1000000000);
    ts.tv_nsec = static_cast<long>(ns % 1000000000);
    return ts;
}

}  // namespace

std::unique_ptr<SampleRingReader> SampleRingReader::Map(ndk::ScopedFileDescriptor fd,
                                                        std::string* error) {
    if (fd.get() < 0) {
        *error = "no descriptor";
        return nullptr;
    }
    size_t size = 0;
    if (!MemorySize(fd.get(), &size, error)) return nullptr;
    if (size < sizeof(vyr_ring_header)) {
        *error = "too small for a sample ring: " + std::to_string(size) + " bytes, its header " +
                 "alone takes " + std::to_string(sizeof(vyr_ring_header));
        return nullptr;
    }
    // Read-only: the service hands over a descriptor that cannot map the ring writable anyway,
    // and a reader has nothing to write.
    void* address = mmap(nullptr, size, PROT_READ, MAP_SHARED, fd.get(), 0);
    if (address == MAP_FAILED) {
        *error = Failed("mmap");
        return nullptr;
    }
    // From here the reader owns the mapping, and its destructor unmaps it on every refusal.
    std::unique_ptr<SampleRingReader> reader(new SampleRingReader(address, size));
    if (!reader->CheckHeader(error)) return nullptr;
    return reader;
}

SampleRingReader::~SampleRingReader() {
    munmap(const_cast<void*>(address_), size_);
}

bool SampleRingReader::CheckHeader(std::string* error) {
    const vyr_ring_header* header = static_cast<const vyr_ring_header*>(address_);
    char text[160];
    if (header->magic != VYR_RING_MAGIC) {
        snprintf(text, sizeof(text), "not a sample ring: magic 0x%08" PRIx32 ", not 0x%08x",
                 header->magic, VYR_RING_MAGIC);
    } else if (header->layout_version != VYR_RING_LAYOUT_VERSION) {
        snprintf(text, sizeof(text), "ring layout version %" PRIu32 ", this reader knows %u",
                 header->layout_version, VYR_RING_LAYOUT_VERSION);
    } else if (header->header_size != sizeof(vyr_ring_header) ||
               header->record_size != sizeof(vyr_ring_record)) {
        snprintf(text, sizeof(text),
                 "ring header of %" PRIu32 " bytes and records of %" PRIu32
                 ", not %zu and %zu as layout version %u has them",
                 header->header_size, header->record_size, sizeof(vyr_ring_header),
                 sizeof(vyr_ring_record), VYR_RING_LAYOUT_VERSION);
    } else if (header->capacity == 0) {
        snprintf(text, sizeof(text), "ring capacity of %" PRIu32 " records", header->capacity);
    } else if (size_ < RingBytes(header->capacity)) {
        // In 64 bits: what a 32-bit size_t would wrap, no mapping can hold anyway.
        snprintf(text, sizeof(text),
                 "truncated ring: %zu bytes, where its %" PRIu32 " records need %" PRIu64, size_,
                 header->capacity, RingBytes(header->capacity));
    } else {
        header_ = header;
        records_ = static_cast<const char*>(address_) + sizeof(vyr_ring_header);
        capacity_ = header->capacity;
        mode_ = header->mode;
        return true;
    }
    *error = text;
    return false;
}

uint64_t SampleRingReader::OldestSeq(uint64_t last) const {
    return last >= capacity_ ? last - capacity_ + 1 : 1;
}

const vyr_ring_record* SampleRingReader::Slot(uint64_t seq) const {
    return reinterpret_cast<const vyr_ring_record*>(records_ +
                                                    (seq % capacity_) * sizeof(vyr_ring_record));
}

SampleRingReader::ReadResult SampleRingReader::ReadSeq(uint64_t seq, RingSample* out) const {
    const uint64_t last = LastSeq();
    if (seq > last) return ReadResult::kNotYetWritten;
    if (seq == 0 || seq < OldestSeq(last)) return ReadResult::kOverwritten;
    // last_seq was published after the record of seq was whole, so the record's slot holds seq
    // or a later lap: a copy torn by the writer, or of another seq, means it was overwritten.
    // No retry, then, and no wait for a writer stopped inside the slot.
    vyr_ring_record copy{};
    if (!vyr_ring_read_record(Slot(seq), &copy) || copy.seq != seq) {
        return ReadResult::kOverwritten;
    }
    *out = ToSample(copy);
    return ReadResult::kOk;
}

bool SampleRingReader::Latest(RingSample* out) const {
    for (;;) {
        const uint64_t last = LastSeq();
        if (last == 0) return false;
        if (ReadSeq(last, out) == ReadResult::kOk) return true;
        // The writer went a whole lap round the ring since `last` was loaded: take the newer.
    }
}

SampleRingReader::Bracket SampleRingReader::Around(int64_t boottime_ns) const {
    Bracket bracket;
    // A search fails only when the writer overwrote a probed record during it, which takes it
    // most of a lap (a second of samples at the shortest period): the next one starts from the
    // newer window.
    while (!SearchAround(boottime_ns, &bracket)) bracket = Bracket();
    return bracket;
}

bool SampleRingReader::SearchAround(int64_t boottime_ns, Bracket* bracket) const {
    const uint64_t last = LastSeq();
    if (last == 0) return true;
    // The first seq of [oldest, last + 1] whose record is after boottime_ns (last + 1: none).
    // Each probe narrows the range and is kept: the last probe at or before the time is the
    // record just below the answer, the last one after it is the answer itself.
    uint64_t low = OldestSeq(last);
    uint64_t high = last + 1;
    while (low < high) {
        const uint64_t middle = low + (high - low) / 2;
        RingSample probe;
        if (ReadSeq(middle, &probe) != ReadResult::kOk) return false;
        if (probe.boottime_ns > boottime_ns) {
            high = middle;
            bracket->after = probe;
        } else {
            low = middle + 1;
            bracket->before = probe;
        }
    }
    return true;
}

bool SampleRingReader::Nearest(int64_t boottime_ns, RingSample* out) const {
    const Bracket bracket = Around(boottime_ns);
    if (!bracket.before && !bracket.after) return false;
    const bool take_before =
        bracket.before && (!bracket.after || Distance(boottime_ns, bracket.before->boottime_ns) <=
                                                 Distance(bracket.after->boottime_ns, boottime_ns));
    *out = take_before ? *bracket.before : *bracket.after;
    return true;
}

SampleRingReader::WaitResult SampleRingReader::WaitNewer(
    uint64_t seq, std::chrono::steady_clock::time_point deadline, RingSample* out) const {
    const timespec until = MonotonicTimespec(deadline);
    // The futex word is cast away from const only for the system call's signature: FUTEX_WAIT
    // reads it, and works on a read-only mapping.
    uint32_t* word = const_cast<uint32_t*>(&header_->futex);
    for (;;) {
        // The word first, then last_seq (the layout's order): a sample written after this load
        // changes the word, and the wait below returns at once.
        const uint32_t seen = __atomic_load_n(word, __ATOMIC_ACQUIRE);
        const uint64_t last = LastSeq();
        if (last > seq) {
            if (ReadSeq(std::max(seq + 1, OldestSeq(last)), out) == ReadResult::kOk) {
                return WaitResult::kOk;
            }
            continue;  // Overwritten between the two loads: the oldest left is newer now.
        }
        if (std::chrono::steady_clock::now() >= deadline) return WaitResult::kTimedOut;
        // Not FUTEX_PRIVATE_FLAG: the writer is another process, and its wake-up reaches the
        // waiters of the shared page, not of this process's address.
        if (syscall(SYS_futex, word, FUTEX_WAIT_BITSET, seen, &until, nullptr,
                    FUTEX_BITSET_MATCH_ANY) != 0) {
            if (errno == EINTR) return WaitResult::kInterrupted;
            // EAGAIN: the word changed before the sleep; ETIMEDOUT: looked at above.
            if (errno != EAGAIN && errno != ETIMEDOUT) return WaitResult::kFailed;
        } else if (__atomic_load_n(word, __ATOMIC_ACQUIRE) != seen) {
            // Woken for a new record, maybe as the one waiter the writer wakes: this reader wakes
            // the others (the layout's protocol), so that the writer's cost stays one wake-up.
            syscall(SYS_futex, word, FUTEX_WAKE, INT_MAX, nullptr, nullptr, 0);
        }
    }
}

}  // namespace vyr
