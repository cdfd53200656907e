// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "ring_memory.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#ifdef __ANDROID__
#include <cutils/ashmem.h>
#endif

namespace android {
namespace vyr {
namespace binder {

namespace {

std::string Failed(const char* what) {
    return std::string(what) + ": " + strerror(errno);
}

}  // namespace

#ifdef __ANDROID__

bool RingMemory::Create(const char* name, size_t size, std::string* error) {
    base::unique_fd fd(ashmem_create_region(name, size));
    if (fd.get() < 0) {
        *error = Failed("ashmem_create_region");
        return false;
    }
    void* address = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, fd.get(), 0);
    if (address == MAP_FAILED) {
        *error = Failed("mmap");
        return false;
    }
    // Later mappings, any process's, are read-only; this one stays writable.
    if (ashmem_set_prot_region(fd.get(), PROT_READ) != 0) {
        *error = Failed("ashmem_set_prot_region");
        munmap(address, size);
        return false;
    }
    address_ = address;
    size_ = size;
    reader_fd_ = std::move(fd);
    return true;
}

#else

bool RingMemory::Create(const char* name, size_t size, std::string* error) {
    base::unique_fd fd(memfd_create(name, MFD_CLOEXEC | MFD_ALLOW_SEALING));
    if (fd.get() < 0) {
        *error = Failed("memfd_create");
        return false;
    }
    if (ftruncate(fd.get(), static_cast<off_t>(size)) != 0) {
        *error = Failed("ftruncate");
        return false;
    }
    void* address = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, fd.get(), 0);
    if (address == MAP_FAILED) {
        *error = Failed("mmap");
        return false;
    }
    // Once the service's own mapping exists, nobody may map the memory writable, write it or
    // resize it, nor lift these seals.
    const int seals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_FUTURE_WRITE | F_SEAL_SEAL;
    // A read-only file description, so that a client cannot even ask for write access.
    base::unique_fd reader;
    if (fcntl(fd.get(), F_ADD_SEALS, seals) != 0) {
        *error = Failed("sealing the memfd");
    } else {
        const std::string path = "/proc/self/fd/" + std::to_string(fd.get());
        reader.reset(open(path.c_str(), O_RDONLY | O_CLOEXEC));
        if (reader.get() < 0) *error = Failed("reopening the memfd read-only");
    }
    if (reader.get() < 0) {
        munmap(address, size);
        return false;
    }
    address_ = address;
    size_ = size;
    reader_fd_ = std::move(reader);
    return true;
}

#endif

RingMemory::~RingMemory() {
    if (address_ != nullptr) munmap(address_, size_);
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
