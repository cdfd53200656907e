// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Version 2's delivery on sample: each k-th stored sample pushed at once, batches held for a
// maximum report latency, Flush, and the end of such a client by Disable or death.

#include <android/log.h>
#include <time.h>

#include <chrono>
#include <set>
#include <thread>
#include <vector>

#include "in_process_service.h"
#include "thread_count.h"

namespace vyr_datapath {
namespace {

using aidl::android::vyr::Event;
using std::chrono::milliseconds;

constexpr size_t kRangeBlock = 2;
// Long enough that no batch falls due on its own during a test.
constexpr int32_t kNeverDue = 600000;

int64_t BootTimeNs() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return int64_t{now.tv_sec} * 1000000000 + now.tv_nsec;
}

std::vector<int64_t> Timestamps(const std::vector<Event>& events) {
    std::vector<int64_t> timestamps;
    for (const Event& event : events) timestamps.push_back(event.timestamp);
    return timestamps;
}

class OnSampleTest : public InProcessServiceTest {
  protected:
    void TearDown() override {
        sensor_doubles::Reset();
        for (int32_t handle : on_sample_) service_->Disable(handle);
        InProcessServiceTest::TearDown();
    }

    std::shared_ptr<RecordingCallback> SetCallbackOk(int32_t handle) {
        auto callback = NewCallback();
        int32_t result = 1;
        EXPECT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
        EXPECT_EQ(result, 0);
        return callback;
    }
    int32_t EnableOnSample(int32_t handle, int32_t period_ms, int32_t latency_ms) {
        int32_t result = 1;
        EXPECT_TRUE(service_->EnableOnSample(handle, period_ms, latency_ms, &result).isOk());
        if (result == 0) on_sample_.insert(handle);
        return result;
    }
    int32_t Flush(int32_t handle) {
        int32_t result = 1;
        EXPECT_TRUE(service_->Flush(handle, &result).isOk());
        return result;
    }
    // Waits until `handle` has taken the sample stored last.
    bool WaitUntilTaken(int32_t handle) {
        const auto deadline = std::chrono::steady_clock::now() + kWait;
        while (!vyr_test::ServicePeer::HasTakenSample(*service_, kRangeBlock, handle)) {
            if (std::chrono::steady_clock::now() >= deadline) return false;
            std::this_thread::sleep_for(milliseconds(1));
        }
        return true;
    }
    bool WaitForActivePeriod(int32_t period_ms) {
        const auto deadline = std::chrono::steady_clock::now() + kWait;
        while (vyr_test::ServicePeer::SnapshotModeBlock(*service_, kRangeBlock).active_period !=
               period_ms) {
            if (std::chrono::steady_clock::now() >= deadline) return false;
            std::this_thread::sleep_for(milliseconds(1));
        }
        return true;
    }
    void Publish(uint32_t time_ms) {
        sensor_doubles::SetRangeData(RangeFrame(time_ms));
        PublishNextSample();
    }

    std::set<int32_t> on_sample_;
};

TEST_F(OnSampleTest, ClientAtThreeTimesTheActivePeriodGetsEveryThirdSample) {
    const int32_t poller = OpenOk(kRange);
    const int32_t pusher = OpenOk(kRange);
    auto callback = SetCallbackOk(pusher);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange);  // samples at 1 ms
    const int64_t enabled_at = BootTimeNs();
    ASSERT_EQ(EnableOnSample(pusher, 3, 0), 0);

    for (uint32_t t = 1; t <= 9; ++t) {
        Publish(t);
        if (t % 3 == 0) {
            ASSERT_TRUE(callback->WaitForEvents(t / 3, kWait)) << "sample " << t;
        }
    }
    const std::vector<Event> events = callback->Events();
    EXPECT_EQ(Timestamps(events), (std::vector<int64_t>{3, 6, 9}));
    EXPECT_TRUE(callback->BatchSizes().empty()) << "latency 0 holds nothing";
    int64_t previous = enabled_at;
    for (const Event& event : events) {
        EXPECT_GT(event.boottime, previous) << "each sample's boot time, in order";
        previous = event.boottime;
    }
    EXPECT_LE(previous, BootTimeNs());
}

TEST_F(OnSampleTest, ChangeOfTheActivePeriodChangesTheStride) {
    const int32_t poller = OpenOk(kRange);
    const int32_t pusher = OpenOk(kRange);
    auto callback = SetCallbackOk(pusher);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange);
    ASSERT_EQ(EnableOnSample(pusher, 3, 0), 0);
    for (uint32_t t = 1; t <= 3; ++t) Publish(t);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));

    // The 1 ms client leaves: the mode now samples at the pusher's own period, so k becomes 1.
    DisableNow(poller);
    ASSERT_TRUE(WaitForActivePeriod(3));
    Publish(4);
    ASSERT_TRUE(callback->WaitForEvents(2, kWait));
    Publish(5);
    ASSERT_TRUE(callback->WaitForEvents(3, kWait));
    EXPECT_EQ(Timestamps(callback->Events()), (std::vector<int64_t>{3, 4, 5}));
}

TEST_F(OnSampleTest, BatchesHoldTheSamplesOfTheLatencyNoneLostNoneTwice) {
    for (uint32_t t = 1; t <= 300; ++t) sensor_doubles::QueueRangeData(RangeFrame(t));
    const int32_t pusher = OpenOk(kRange);
    auto callback = SetCallbackOk(pusher);
    ASSERT_EQ(EnableOnSample(pusher, 33, 300), 0);
    ASSERT_TRUE(callback->WaitForBatches(3, milliseconds(20000)));
    service_->Disable(pusher);

    const std::vector<size_t> sizes = callback->BatchSizes();
    const std::vector<int64_t> timestamps = Timestamps(callback->Events());
    ASSERT_FALSE(timestamps.empty());
    for (size_t i = 0; i < timestamps.size(); ++i) {
        EXPECT_EQ(timestamps[i], timestamps[0] + static_cast<int64_t>(i))
            << "every sample once, in order";
    }
    for (size_t size : sizes) EXPECT_GT(size, 1u) << "samples are held, not sent one by one";
    EXPECT_EQ(callback->Count(), timestamps.size());
}

TEST_F(OnSampleTest, FlushDeliversWhatIsHeldThenCompletes) {
    const int32_t poller = OpenOk(kRange);
    const int32_t pusher = OpenOk(kRange);
    auto callback = SetCallbackOk(pusher);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange);
    ASSERT_EQ(EnableOnSample(pusher, 1, kNeverDue), 0);
    for (uint32_t t = 1; t <= 2; ++t) {
        Publish(t);
        ASSERT_TRUE(WaitUntilTaken(pusher));
    }
    EXPECT_EQ(callback->Count(), 0u);

    EXPECT_EQ(Flush(pusher), 0);
    ASSERT_TRUE(callback->WaitForFlushes(1, kWait));
    EXPECT_EQ(callback->BatchSizes(), (std::vector<size_t>{2}));
    EXPECT_EQ(callback->Flushes(), (std::vector<size_t>{2})) << "the batch comes first";
    EXPECT_EQ(Timestamps(callback->Events()), (std::vector<int64_t>{1, 2}));
}

TEST_F(OnSampleTest, FlushWithNothingHeldStillCompletes) {
    const int32_t poller = OpenOk(kRange);
    const int32_t batched = OpenOk(kRange);
    const int32_t direct = OpenOk(kRange);
    auto batched_callback = SetCallbackOk(batched);
    auto direct_callback = SetCallbackOk(direct);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange);
    ASSERT_EQ(EnableOnSample(batched, 1, kNeverDue), 0);
    ASSERT_EQ(EnableOnSample(direct, 1, 0), 0);

    EXPECT_EQ(Flush(batched), 0);
    EXPECT_EQ(Flush(direct), 0);
    ASSERT_TRUE(batched_callback->WaitForFlushes(1, kWait));
    ASSERT_TRUE(direct_callback->WaitForFlushes(1, kWait));
    EXPECT_TRUE(batched_callback->BatchSizes().empty());
    EXPECT_TRUE(direct_callback->BatchSizes().empty());
    EXPECT_EQ(batched_callback->Count(), 0u);
    EXPECT_EQ(direct_callback->Count(), 0u);
}

TEST_F(OnSampleTest, RefusedRequestsSayWhy) {
    const int32_t polling = OpenOk(kRange);
    const int32_t timed = OpenOk(kRange);
    auto callback = SetCallbackOk(timed);
    constexpr int32_t kUnknown = 12345;

    EXPECT_EQ(EnableOnSample(kUnknown, 10, 0), -38);
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_ERROR, "EnableOnSample invalid handle 12345"));
    EXPECT_EQ(Flush(kUnknown), -38);
    EXPECT_EQ(EnableOnSample(polling, 10, -1), -22) << "a negative latency";
    EXPECT_EQ(EnableOnSample(polling, 10, 300), -22) << "nothing to hand a batch to";
    EXPECT_EQ(Flush(polling), -22) << "not enabled";

    // Enabled the version 1 way: a timer loop, nothing held, nothing to flush.
    EnableOk(timed, 10);
    EXPECT_EQ(Flush(timed), -22);
    EXPECT_EQ(EnableOnSample(timed, 10, 0), -17);
    EXPECT_EQ(callback->Flushes().size(), 0u);
}

TEST_F(OnSampleTest, DisableEndsTheDeliveryThread) {
    const int32_t poller = OpenOk(kRange);
    const int32_t pusher = OpenOk(kRange);
    auto callback = SetCallbackOk(pusher);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange);
    const size_t sampling_threads = vyr_test::ThreadCount();
    ASSERT_EQ(EnableOnSample(pusher, 1, 0), 0);
    Publish(1);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));

    service_->Disable(pusher);
    EXPECT_TRUE(vyr_test::WaitForThreadCount(sampling_threads, kWait)) << vyr_test::ThreadNames();
    Publish(2);
    Event event{};
    EXPECT_EQ(Poll(poller, &event), 0);
    EXPECT_EQ(event.timestamp, 2) << "the sample was stored";
    EXPECT_EQ(callback->Count(), 1u) << "and nothing took it for the disabled client";
}

TEST_F(OnSampleTest, DeathOfTheClientEndsItsDelivery) {
    const int32_t poller = OpenOk(kRange);
    const int32_t pusher = OpenOk(kRange);
    auto callback = SetCallbackOk(pusher);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange);
    const size_t sampling_threads = vyr_test::ThreadCount();
    ASSERT_EQ(EnableOnSample(pusher, 1, kNeverDue), 0);
    Publish(1);
    ASSERT_TRUE(WaitUntilTaken(pusher));

    vyr_test::ServicePeer::DeliverBinderDeath(*service_, callback->asBinder().get());
    EXPECT_TRUE(vyr_test::WaitForThreadCount(sampling_threads, kWait)) << vyr_test::ThreadNames();
    EXPECT_EQ(Flush(pusher), -38) << "the client is gone";
    EXPECT_EQ(callback->Count(), 0u) << "what was held goes with the client";
}

TEST_F(OnSampleTest, PolledEventCarriesTheBootTimeOfItsRead) {
    const int32_t poller = OpenOk(kRange);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange);
    Event event{};
    Poll(poller, &event);
    const int64_t before = BootTimeNs();
    Publish(1);
    const int64_t after = BootTimeNs();
    ASSERT_EQ(Poll(poller, &event), 0);
    EXPECT_GE(event.boottime, before);
    EXPECT_LE(event.boottime, after);
}

}  // namespace
}  // namespace vyr_datapath
