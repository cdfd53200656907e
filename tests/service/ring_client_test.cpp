// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Clients enabled on the sample ring (EnableRing): the answers, the descriptor, and when the
// processing loop writes the ring.

#include <android/log.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vyr/sample_ring_layout.h>

#include <csignal>
#include <functional>
#include <memory>

#include "child_process.h"
#include "sensor_doubles.h"
#include "service_fixture.h"
#include "temp_dir.h"
#include "vyrservice_test_peer.h"
#include "wait_until.h"

namespace vyr_test::service {
namespace {

using aidl::android::vyr::Event;

// A client's read-only mapping of a ring descriptor.
class RingMapping {
  public:
    explicit RingMapping(int fd) {
        struct stat st {};
        if (fstat(fd, &st) != 0 || st.st_size < static_cast<off_t>(sizeof(vyr_ring_header))) {
            return;
        }
        size_ = static_cast<size_t>(st.st_size);
        void* address = mmap(nullptr, size_, PROT_READ, MAP_SHARED, fd, 0);
        if (address != MAP_FAILED) header_ = static_cast<const vyr_ring_header*>(address);
    }
    ~RingMapping() {
        if (header_ != nullptr) munmap(const_cast<vyr_ring_header*>(header_), size_);
    }
    RingMapping(const RingMapping&) = delete;
    RingMapping& operator=(const RingMapping&) = delete;

    const vyr_ring_header* header() const { return header_; }
    uint64_t last_seq() const { return vyr_ring_last_seq(header_); }
    // The record of `seq`, read whole.
    vyr_ring_record Read(uint64_t seq) const {
        vyr_ring_record record{};
        while (!vyr_ring_read_record(vyr_ring_slot(header_, seq), &record)) {
        }
        return record;
    }

  private:
    const vyr_ring_header* header_ = nullptr;
    size_t size_ = 0;
};

class RingClientTest : public ServiceFixture {
  protected:
    // Every read of either sensor gives a valid sample: two range zones, a lit light sensor.
    void SetUp() override {
        ServiceFixture::SetUp();
        MultiRangingData range{};
        range.time_ms = 1234;
        range.zone_count = 2;
        range.zones[0].distance_mm = 420;
        range.zones[1].distance_mm = 1337;
        range.valid = 1;
        sensor_doubles::SetRangeData(range);
        ALSResult light{};
        light.status = 3;
        light.channels[0] = 11.5f;
        light.channels[4] = 2.25f;
        light.lux = 300.0f;
        light.color_temperature = 5000.0f;
        light.valid = 1;
        light.timestamp_ns = 987654321;
        sensor_doubles::SetAlsData(light);
    }

    // EnableRing's answer; the descriptor goes to `ring`.
    int32_t EnableRing(int32_t handle, int32_t period, ndk::ScopedFileDescriptor* ring) {
        int32_t result = 1;
        EXPECT_TRUE(service_->EnableRing(handle, period, ring, &result).isOk());
        return result;
    }

    // Opens a client of `mode` and enables it on the ring; the ring's descriptor, -1 on failure.
    ndk::ScopedFileDescriptor OpenRing(int32_t mode, int32_t period) {
        ndk::ScopedFileDescriptor ring;
        const int32_t handle = Open(mode);
        handle_ = handle;
        EXPECT_EQ(0, EnableRing(handle, period, &ring));
        return ring;
    }

    // Makes the service and a ring client of `mode`, whose ring `ring_` maps.
    void StartRing(int32_t mode, int32_t period) {
        MakeService();
        ring_fd_ = OpenRing(mode, period);
        ring_ = std::make_unique<RingMapping>(ring_fd_.get());
        ASSERT_NE(ring_->header(), nullptr);
    }

    // Whether the ring goes past `seq` within the wait.
    static bool Advances(const RingMapping& ring, uint64_t seq) {
        return WaitUntil([&] { return ring.last_seq() > seq; }, kWait);
    }

    // Waits until the block of `mode` has stored `count` more samples, so that the ring had
    // every chance to be written.
    bool WaitForSamples(int32_t mode, uint64_t count) {
        const size_t block = BlockOf(mode);
        const uint64_t target = ServicePeer::SamplesStored(*service_, block) + count;
        return WaitUntil([&] { return ServicePeer::SamplesStored(*service_, block) >= target; },
                         kWait);
    }

    int32_t handle_ = 0;
    ndk::ScopedFileDescriptor ring_fd_;
    std::unique_ptr<RingMapping> ring_;
};

TEST_F(RingClientTest, UnknownAndEnabledHandlesGetEnablesAnswersAndNoRing) {
    MakeService();
    ndk::ScopedFileDescriptor ring;
    EXPECT_EQ(-38, EnableRing(77, 10, &ring));
    EXPECT_EQ(ring.get(), -1);
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_ERROR, "EnableRing invalid handle 77"));

    const int32_t plain = Open(3);
    ASSERT_EQ(0, Enable(plain, 100));
    EXPECT_EQ(-17, EnableRing(plain, 10, &ring));
    EXPECT_EQ(ring.get(), -1);

    const int32_t ringed = Open(1);
    ASSERT_EQ(0, EnableRing(ringed, 100, &ring));
    ndk::ScopedFileDescriptor again;
    EXPECT_EQ(-17, EnableRing(ringed, 100, &again));
    EXPECT_EQ(again.get(), -1);
    DisableAndWait(ringed);
    DisableAndWait(plain);
}

TEST_F(RingClientTest, TheDescriptorCanNeitherWriteNorGrowTheRing) {
    MakeService();
    ndk::ScopedFileDescriptor ring = OpenRing(3, 20);
    ASSERT_GE(ring.get(), 0);
    EXPECT_EQ(fcntl(ring.get(), F_GETFL) & O_ACCMODE, O_RDONLY);
    struct stat st {};
    ASSERT_EQ(fstat(ring.get(), &st), 0);
    const size_t size = static_cast<size_t>(st.st_size);
    EXPECT_GE(size, vyr_ring_bytes(VYR_RING_CAPACITY));

    EXPECT_EQ(mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, ring.get(), 0), MAP_FAILED);
    void* mapped = mmap(nullptr, size, PROT_READ, MAP_SHARED, ring.get(), 0);
    ASSERT_NE(mapped, MAP_FAILED);
    EXPECT_NE(mprotect(mapped, size, PROT_READ | PROT_WRITE), 0);
    munmap(mapped, size);
    const char byte = 1;
    EXPECT_EQ(pwrite(ring.get(), &byte, 1, 0), -1);
    EXPECT_NE(ftruncate(ring.get(), static_cast<off_t>(size * 2)), 0);
    // Even a writable description of the same memory, as /proc hands one out, cannot.
    const std::string path = "/proc/self/fd/" + std::to_string(ring.get());
    ndk::ScopedFileDescriptor writable(open(path.c_str(), O_RDWR | O_CLOEXEC));
    if (writable.get() >= 0) {
        EXPECT_EQ(mmap(nullptr, size, PROT_WRITE, MAP_SHARED, writable.get(), 0), MAP_FAILED);
        EXPECT_EQ(pwrite(writable.get(), &byte, 1, 0), -1);
        EXPECT_NE(ftruncate(writable.get(), 0), 0);
    }
    ASSERT_EQ(fstat(ring.get(), &st), 0);
    EXPECT_EQ(static_cast<size_t>(st.st_size), size);
    DisableAndWait(handle_);
}

TEST_F(RingClientTest, EachSampleIsARecordInOrderWithItsEventAndBoottime) {
    ASSERT_NO_FATAL_FAILURE(StartRing(3, 10));
    const RingMapping& ring = *ring_;
    const vyr_ring_header& header = *ring.header();
    EXPECT_EQ(header.magic, VYR_RING_MAGIC);
    EXPECT_EQ(header.layout_version, VYR_RING_LAYOUT_VERSION);
    EXPECT_EQ(header.header_size, sizeof(vyr_ring_header));
    EXPECT_EQ(header.record_size, sizeof(vyr_ring_record));
    EXPECT_GE(header.capacity, 1000u) << "one second at 1 ms";
    EXPECT_EQ(header.mode, 3);

    // A plain client polls samples; the ring holds each one with the same fields.
    const int32_t poller = Open(3);
    ASSERT_EQ(0, Enable(poller, 10));
    std::vector<Event> polled;
    ASSERT_TRUE(WaitUntil(
        [&] {
            Event event;
            if (Poll(poller, &event) == 0) polled.push_back(event);
            return polled.size() >= 3;
        },
        kWait));
    Disable(poller);
    ASSERT_TRUE(Advances(ring, 5));
    const uint64_t last = ring.last_seq();
    int64_t previous = 0;
    for (uint64_t seq = 1; seq <= last; ++seq) {
        const vyr_ring_record record = ring.Read(seq);
        EXPECT_EQ(record.seq, seq);
        EXPECT_GE(record.boottime_ns, previous);
        previous = record.boottime_ns;
    }
    for (const Event& event : polled) {
        bool found = false;
        for (uint64_t seq = 1; seq <= ring.last_seq() && !found; ++seq) {
            const vyr_ring_record record = ring.Read(seq);
            if (record.boottime_ns != event.boottime) continue;
            found = true;
            EXPECT_EQ(record.timestamp, event.timestamp);
            EXPECT_EQ(record.status, event.status);
            EXPECT_EQ(record.value0, event.value0);
            EXPECT_EQ(record.value1, event.value1);
            ASSERT_EQ(record.data_count, event.data.size());
            EXPECT_TRUE(std::equal(event.data.begin(), event.data.end(), record.data));
        }
        EXPECT_TRUE(found) << "no record of the sample read at " << event.boottime;
    }
    DisableAndWait(handle_);
}

// Nothing waits for a reader: a ring that nobody reads is written around and around, and the
// mode's other clients get their samples all the while.
TEST_F(RingClientTest, ARingNobodyReadsHoldsNothingBack) {
    ASSERT_NO_FATAL_FAILURE(StartRing(3, 1));
    const RingMapping& ring = *ring_;
    const int32_t poller = Open(3);
    ASSERT_EQ(0, Enable(poller, 1));
    const uint64_t lap = ring.header()->capacity + 16;
    int polled = 0;
    EXPECT_TRUE(WaitUntil(
        [&] {
            Event event;
            if (Poll(poller, &event) == 0) ++polled;
            return ring.last_seq() > lap;
        },
        kWait));
    EXPECT_GT(polled, 0);
    const uint64_t last = ring.last_seq();
    EXPECT_EQ(ring.Read(last).seq, last);
    DisableAndWait(poller);
    DisableAndWait(handle_);
}

TEST_F(RingClientTest, EveryRingClientOfAModeMapsTheSameRing) {
    MakeService();
    ndk::ScopedFileDescriptor first = OpenRing(1, 50);
    const int32_t first_handle = handle_;
    ndk::ScopedFileDescriptor second = OpenRing(1, 50);
    struct stat a {
    }, b{};
    ASSERT_EQ(fstat(first.get(), &a), 0);
    ASSERT_EQ(fstat(second.get(), &b), 0);
    EXPECT_EQ(a.st_ino, b.st_ino);
    EXPECT_EQ(a.st_dev, b.st_dev);
    DisableAndWait(first_handle);
    DisableAndWait(handle_);
}

// How a ring client leaves: the ring is written no more, though the mode samples on for another
// client.
class RingReleaseTest : public RingClientTest {
  protected:
    void ExpectWrittenOnlyWhileEnabled(const std::function<void(int32_t handle)>& release) {
        MakeService();
        const int32_t plain = OpenAndEnable(3, 10);
        ndk::ScopedFileDescriptor fd = OpenRing(3, 10);
        RingMapping ring(fd.get());
        ASSERT_NE(ring.header(), nullptr);
        ASSERT_TRUE(Advances(ring, 3));
        release(handle_);
        const uint64_t frozen = ring.last_seq();
        ASSERT_TRUE(WaitForSamples(3, 5));
        EXPECT_EQ(ring.last_seq(), frozen) << "written after its only client left";
        // A new ring client finds the same ring, written on from where it stopped.
        ndk::ScopedFileDescriptor again = OpenRing(3, 10);
        RingMapping second(again.get());
        ASSERT_TRUE(Advances(ring, frozen));
        EXPECT_EQ(second.Read(frozen + 1).seq, frozen + 1);
        DisableAndWait(handle_);
        DisableAndWait(plain);
    }
};

TEST_F(RingReleaseTest, DisableEndsTheWriting) {
    ExpectWrittenOnlyWhileEnabled([this](int32_t handle) { Disable(handle); });
}

TEST_F(RingReleaseTest, CloseEndsTheWriting) {
    int32_t closed = 0;
    ExpectWrittenOnlyWhileEnabled([&](int32_t handle) {
        // Closed while enabled, as a client that skips Disable does.
        closed = handle;
        ASSERT_TRUE(service_->Close(handle).isOk());
    });
    // Its enable stays with the worker, as for any client closed while enabled; withdrawn here
    // so that the service can end.
    ServicePeer::PushWorkItem(*service_, android::vyr::binder::WorkItem{false, 3, closed, 0});
    EXPECT_TRUE(WaitForWorkLog("DisableWork", closed));
}

TEST_F(RingReleaseTest, TheClientsDeathEndsTheWriting) {
    TempDir dir;
    std::unique_ptr<ChildProcess> client = StartSleeper(dir.Path("stderr"));
    ASSERT_TRUE(client->started());
    ExpectWrittenOnlyWhileEnabled([&](int32_t handle) {
        ServicePeer::SetOnlyClientProcess(*service_, handle, client->pid());
        client->Signal(SIGKILL);
        ASSERT_TRUE(client->Wait(kWait).has_value());
        ASSERT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO,
                                 "client " + std::to_string(handle) +
                                     " mode 3 died; disable sensor and remove client handle",
                                 kWait));
    });
}

TEST_F(RingClientTest, NoRingIsWrittenWithoutARingClient) {
    MakeService();
    const int32_t plain = OpenAndEnable(1, 10);
    ASSERT_TRUE(WaitForSamples(1, 3));
    // The ring exists from the first ring client on; before, no sample went anywhere but polls.
    ndk::ScopedFileDescriptor fd = OpenRing(1, 10);
    RingMapping ring(fd.get());
    ASSERT_NE(ring.header(), nullptr);
    ASSERT_TRUE(Advances(ring, 0));
    EXPECT_LE(ring.last_seq(), ServicePeer::SamplesStored(*service_, BlockOf(1)) - 3);
    DisableAndWait(handle_);
    DisableAndWait(plain);
}

}  // namespace
}  // namespace vyr_test::service
