// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sample_ring.h"

#include <fcntl.h>
#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>

namespace android {
namespace vyr {
namespace binder {

std::unique_ptr<SampleRing> SampleRing::Create(int32_t mode, uint32_t capacity, std::string* error) {
    std::unique_ptr<SampleRing> ring(new SampleRing());
    const std::string name = "vyr-ring-mode-" + std::to_string(mode);
    if (!ring->memory_.Create(name.c_str(), vyr_ring_bytes(capacity), error)) return nullptr;
    // Fresh shared memory is zeroed: last_seq 0 and every record's lock even.
    vyr_ring_header* header = static_cast<vyr_ring_header*>(ring->memory_.address());
    header->magic = VYR_RING_MAGIC;
    header->layout_version = VYR_RING_LAYOUT_VERSION;
    header->header_size = sizeof(vyr_ring_header);
    header->record_size = sizeof(vyr_ring_record);
    header->capacity = capacity;
    header->mode = mode;
    ring->header_ = header;
    return ring;
}

void SampleRing::Write(const aidl::android::vyr::Event& event) {
    vyr_ring_record record{};
    record.seq = vyr_ring_last_seq(header_) + 1;
    record.boottime_ns = event.boottime;
    record.timestamp = event.timestamp;
    record.status = event.status;
    record.value0 = event.value0;
    record.value1 = event.value1;
    record.data_count =
        static_cast<uint32_t>(std::min<size_t>(event.data.size(), VYR_RING_DATA_CAPACITY));
    std::copy_n(event.data.begin(), record.data_count, record.data);
    vyr_ring_write_record(header_, &record);
    // One waiter, which wakes the others: the cost here does not grow with the readers. Not
    // private: the waiters are other processes mapping the same memory.
    syscall(SYS_futex, &header_->futex, FUTEX_WAKE, 1, nullptr, nullptr, 0);
}

ndk::ScopedFileDescriptor SampleRing::ReaderFd() const {
    return ndk::ScopedFileDescriptor(fcntl(memory_.reader_fd(), F_DUPFD_CLOEXEC, 0));
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
