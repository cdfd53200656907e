// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The descriptor a client gets and what SampleRingReader accepts: a client can neither map the
// ring writable, nor make its mapping writable, nor write, resize or reopen it for writing; and
// a descriptor that is no ring of this layout, or too small for its header, is refused with a
// reason, leaving neither a mapping nor the descriptor behind.

#include <dirent.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>
#include <vyr/sample_ring_layout.h>
#include <vyr/sample_ring_reader.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "ring_fixture.h"
#include "test_files.h"

namespace vyr_test::client {
namespace {

constexpr char kServiceRingName[] = "vyr-ring-mode-3";

// The address and size of this process's mapping of the memfd `name` with permissions `perms`
// ("r--s"), from /proc/self/maps; null when there is none.
std::pair<void*, size_t> FindMapping(const std::string& name, const std::string& perms) {
    for (const std::string& line : SplitLines(ReadFile("/proc/self/maps"))) {
        unsigned long start = 0;
        unsigned long end = 0;
        char line_perms[8] = {};
        if (sscanf(line.c_str(), "%lx-%lx %7s", &start, &end, line_perms) != 3) continue;
        if (line_perms == perms && line.find("memfd:" + name) != std::string::npos) {
            return {reinterpret_cast<void*>(start), end - start};
        }
    }
    return {nullptr, 0};
}

int OpenDescriptors() {
    int count = 0;
    DIR* dir = opendir("/proc/self/fd");
    if (dir == nullptr) return -1;
    while (readdir(dir) != nullptr) ++count;
    closedir(dir);
    return count;
}

TEST(RingDescriptorTest, AClientCannotMapTheRingWritable) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    ndk::ScopedFileDescriptor fd = fixture.ClientFd();
    ASSERT_GE(fd.get(), 0);
    const size_t size = vyr_ring_bytes(8);
    void* address = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, fd.get(), 0);
    EXPECT_EQ(address, MAP_FAILED);
    if (address != MAP_FAILED) munmap(address, size);
}

TEST(RingDescriptorTest, TheReadersMappingCannotBeMadeWritable) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    const auto [address, size] = FindMapping(kServiceRingName, "r--s");
    ASSERT_NE(address, nullptr) << "the reader's mapping is not a read-only shared one:\n"
                                << ReadFile("/proc/self/maps");
    EXPECT_NE(mprotect(address, size, PROT_READ | PROT_WRITE), 0);
    EXPECT_NE(FindMapping(kServiceRingName, "r--s").first, nullptr);
    fixture.Write(100);
    vyr::RingSample sample;
    EXPECT_TRUE(fixture.reader().Latest(&sample));
}

TEST(RingDescriptorTest, AClientCannotWriteOrResizeTheRing) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    ndk::ScopedFileDescriptor fd = fixture.ClientFd();
    const uint32_t bytes = 0xffffffff;
    EXPECT_LT(write(fd.get(), &bytes, sizeof(bytes)), 0);
    EXPECT_LT(pwrite(fd.get(), &bytes, sizeof(bytes), 0), 0);
    EXPECT_NE(ftruncate(fd.get(), static_cast<off_t>(vyr_ring_bytes(8) * 2)), 0);
    EXPECT_NE(ftruncate(fd.get(), 0), 0);
    fixture.Write(100);
    vyr::RingSample sample;
    ASSERT_TRUE(fixture.reader().Latest(&sample));
    EXPECT_TRUE(IsWholeSample(sample));
}

// Opening the descriptor's /proc path again asks the file for new access: the memory itself
// must still refuse writes, whatever the new description allows.
TEST(RingDescriptorTest, ReopeningTheDescriptorGivesNoWayToWrite) {
    RingFixture fixture(8);
    ASSERT_TRUE(fixture.ready());
    ndk::ScopedFileDescriptor fd = fixture.ClientFd();
    const std::string path = "/proc/self/fd/" + std::to_string(fd.get());
    const int reopened = open(path.c_str(), O_RDWR | O_CLOEXEC);
    if (reopened < 0) return;  // Refused outright: nothing to write through.
    const size_t size = vyr_ring_bytes(8);
    void* address = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, reopened, 0);
    EXPECT_EQ(address, MAP_FAILED);
    if (address != MAP_FAILED) munmap(address, size);
    const uint32_t bytes = 0xffffffff;
    EXPECT_LT(pwrite(reopened, &bytes, sizeof(bytes), 0), 0);
    EXPECT_NE(ftruncate(reopened, 0), 0);
    close(reopened);
}

// A memfd named `name` holding `header` and then zeros up to `size` bytes.
int MakeMemfd(const char* name, const vyr_ring_header& header, size_t size) {
    const int fd = memfd_create(name, MFD_CLOEXEC);
    if (fd < 0) return -1;
    if (ftruncate(fd, static_cast<off_t>(size)) != 0 ||
        pwrite(fd, &header, std::min(size, sizeof(header)), 0) < 0) {
        close(fd);
        return -1;
    }
    return fd;
}

vyr_ring_header GoodHeader(uint32_t capacity) {
    vyr_ring_header header{};
    header.magic = VYR_RING_MAGIC;
    header.layout_version = VYR_RING_LAYOUT_VERSION;
    header.header_size = sizeof(vyr_ring_header);
    header.record_size = sizeof(vyr_ring_record);
    header.capacity = capacity;
    header.mode = 1;
    return header;
}

class MalformedRingTest : public ::testing::Test {
  protected:
    // Maps a memfd with `header` of `size` bytes; the error when it is refused, "mapped" when it
    // is not. Checks that a refusal leaves no mapping and no descriptor behind.
    std::string MapMemfd(const vyr_ring_header& header, size_t size) {
        const int before = OpenDescriptors();
        const int fd = MakeMemfd(kName, header, size);
        if (fd < 0) {
            ADD_FAILURE() << "memfd: " << strerror(errno);
            return "";
        }
        std::string error;
        std::unique_ptr<vyr::SampleRingReader> reader =
            vyr::SampleRingReader::Map(ndk::ScopedFileDescriptor(fd), &error);
        if (reader != nullptr) return "mapped";
        EXPECT_EQ(FindMapping(kName, "r--s").first, nullptr) << "a refused ring stays mapped";
        EXPECT_EQ(OpenDescriptors(), before) << "a refused ring's descriptor stays open";
        EXPECT_FALSE(error.empty());
        return error;
    }

    static constexpr char kName[] = "vyr-test-ring";
};

TEST_F(MalformedRingTest, AWellFormedRingOfAnyCapacityMaps) {
    EXPECT_EQ(MapMemfd(GoodHeader(3), vyr_ring_bytes(3)), "mapped");
    // Memory rounded up past the records is no defect.
    EXPECT_EQ(MapMemfd(GoodHeader(3), 4096), "mapped");
}

TEST_F(MalformedRingTest, AnEmptyMemfdIsRefused) {
    EXPECT_NE(MapMemfd(GoodHeader(3), 0).find("too small"), std::string::npos);
}

TEST_F(MalformedRingTest, AMemfdSmallerThanTheHeaderIsRefused) {
    EXPECT_NE(MapMemfd(GoodHeader(3), sizeof(vyr_ring_header) - 4).find("too small"),
              std::string::npos);
}

TEST_F(MalformedRingTest, AWrongMagicIsRefused) {
    vyr_ring_header header = GoodHeader(3);
    header.magic = 0x12345678;
    EXPECT_NE(MapMemfd(header, vyr_ring_bytes(3)).find("not a sample ring"), std::string::npos);
}

TEST_F(MalformedRingTest, AnotherLayoutVersionIsRefused) {
    vyr_ring_header header = GoodHeader(3);
    header.layout_version = VYR_RING_LAYOUT_VERSION + 1;
    EXPECT_NE(MapMemfd(header, vyr_ring_bytes(3)).find("layout version"), std::string::npos);
}

TEST_F(MalformedRingTest, OtherHeaderOrRecordSizesAreRefused) {
    vyr_ring_header header = GoodHeader(3);
    header.record_size = sizeof(vyr_ring_record) + 4;
    EXPECT_NE(MapMemfd(header, 4096).find("records of"), std::string::npos);
    header = GoodHeader(3);
    header.header_size = 128;
    EXPECT_NE(MapMemfd(header, 4096).find("records of"), std::string::npos);
}

TEST_F(MalformedRingTest, AZeroCapacityIsRefused) {
    EXPECT_NE(MapMemfd(GoodHeader(0), 4096).find("capacity"), std::string::npos);
}

TEST_F(MalformedRingTest, ARingTooSmallForItsRecordsIsRefused) {
    const std::string error = MapMemfd(GoodHeader(1024), vyr_ring_bytes(10));
    EXPECT_NE(error.find("truncated"), std::string::npos) << error;
    EXPECT_NE(MapMemfd(GoodHeader(3), vyr_ring_bytes(3) - 1).find("truncated"), std::string::npos);
}

TEST_F(MalformedRingTest, APipeIsRefused) {
    int ends[2];
    ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
    close(ends[1]);
    const int before = OpenDescriptors();
    std::string error;
    EXPECT_EQ(vyr::SampleRingReader::Map(ndk::ScopedFileDescriptor(ends[0]), &error), nullptr);
    EXPECT_NE(error.find("not shared memory"), std::string::npos) << error;
    EXPECT_EQ(OpenDescriptors(), before - 1) << "the refused pipe stays open";
}

TEST_F(MalformedRingTest, NoDescriptorIsRefused) {
    std::string error;
    EXPECT_EQ(vyr::SampleRingReader::Map(ndk::ScopedFileDescriptor(), &error), nullptr);
    EXPECT_EQ(error, "no descriptor");
}

}  // namespace
}  // namespace vyr_test::client
