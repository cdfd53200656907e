// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Version 2's delivery on sample: each k-th stored sample pushed at once, batches held for a
// maximum report latency, Flush, and the end of such a client by Disable or death.

#include <aidl/android/vyr/Event.h>
#include <android/log.h>
#include <time.h>

#include <atomic>
#include <chrono>
#include <future>
#include <nlohmann/json.hpp>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "data_path_fixture.h"
#include "event_parcel.h"
#include "service_dump.h"
#include "thread_count.h"
#include "vyrservice_test_peer.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;
using std::chrono::milliseconds;

constexpr size_t kRangeBlock = 2;
// The longest latency there is: no batch falls due on its own during a test.
constexpr int32_t kNeverDue = 60000;
// What a batch may take in a parcel.
constexpr size_t kBatchBudgetBytes = 128 * 1024;

int64_t BootTimeNs() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return int64_t{now.tv_sec} * 1000000000 + now.tv_nsec;
}

// Range frames numbered `first`, `first` + 1, ... by their sensor time, with `zones` zones,
// queued for the reads to come.
void QueueNumberedFrames(uint32_t first, uint32_t count, uint8_t zones) {
    for (uint32_t t = first; t < first + count; ++t) {
        MultiRangingData frame = RangeFrame(t);
        frame.zone_count = zones;
        sensor_doubles::QueueRangeData(frame);
    }
}

// Whether `events` are consecutive frames, each once, in order.
::testing::AssertionResult Consecutive(const std::vector<Event>& events) {
    for (size_t i = 0; i < events.size(); ++i) {
        if (events[i].timestamp != events[0].timestamp + static_cast<int64_t>(i)) {
            return ::testing::AssertionFailure()
                   << "event " << i << " is frame " << events[i].timestamp << " after frame "
                   << events[0].timestamp;
        }
    }
    return ::testing::AssertionSuccess();
}

std::vector<int64_t> Timestamps(const std::vector<Event>& events) {
    std::vector<int64_t> timestamps;
    for (const Event& event : events) timestamps.push_back(event.timestamp);
    return timestamps;
}

class OnSampleTest : public DataPathTest {
  protected:
    void SetUp() override {
        DataPathTest::SetUp();
        // Range clients only: without the light sensor there is no display monitor, whose end
        // could race the tests' counts of threads.
        MakeService(false);
    }
    void TearDown() override {
        sensor_doubles::Reset();
        for (int32_t handle : on_sample_) service_->Disable(handle);
        DataPathTest::TearDown();
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
    nlohmann::json ClientInDump(int32_t handle) {
        const vyr_test::DumpResult dump = vyr_test::DumpOf(service_->asBinder().get(), {"--json"});
        const nlohmann::json parsed = nlohmann::json::parse(dump.text);
        for (const nlohmann::json& client : parsed["clients"]) {
            if (client["handle"] == handle) return client;
        }
        return nlohmann::json();
    }
    uint64_t SamplesStored() {
        return vyr_test::ServicePeer::SamplesStored(*service_, kRangeBlock);
    }
    struct PollerAndPusher {
        int32_t poller;
        int32_t pusher;
        std::shared_ptr<RecordingCallback> callback;
    };
    // A poller whose held sampling at 1 ms lets the test publish each sample, beside a pusher
    // with a callback that is not enabled yet.
    PollerAndPusher StartPollerAndPusher() {
        PollerAndPusher clients{Open(kRange), Open(kRange), nullptr};
        for (int32_t handle : {clients.poller, clients.pusher}) EXPECT_GT(handle, 0);
        clients.callback = SetCallbackOk(clients.pusher);
        sensor_doubles::SetRangeData(RangeFrame(0));
        StartHeldSampling(clients.poller, kRange);
        return clients;
    }
    // A pusher enabled on sample at 1 ms that holds every sample: its handle.
    int32_t StartHoldingClient(std::shared_ptr<RecordingCallback>* callback) {
        const PollerAndPusher clients = StartPollerAndPusher();
        *callback = clients.callback;
        EXPECT_EQ(EnableOnSample(clients.pusher, 1, kNeverDue), 0);
        return clients.pusher;
    }
    void Publish(uint32_t time_ms) {
        sensor_doubles::SetRangeData(RangeFrame(time_ms));
        PublishNextSample();
    }

    std::set<int32_t> on_sample_;
};

TEST_F(OnSampleTest, ClientAtThreeTimesTheActivePeriodGetsEveryThirdSample) {
    const auto [poller, pusher, callback] = StartPollerAndPusher();
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
    const auto [poller, pusher, callback] = StartPollerAndPusher();
    ASSERT_EQ(EnableOnSample(pusher, 3, 0), 0);
    for (uint32_t t = 1; t <= 3; ++t) Publish(t);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));

    // The 1 ms client leaves: the mode now samples at the pusher's own period, so k becomes 1.
    Disable(poller);
    ASSERT_TRUE(WaitForActivePeriod(3));
    Publish(4);
    ASSERT_TRUE(callback->WaitForEvents(2, kWait));
    Publish(5);
    ASSERT_TRUE(callback->WaitForEvents(3, kWait));
    EXPECT_EQ(Timestamps(callback->Events()), (std::vector<int64_t>{3, 4, 5}));
}

TEST_F(OnSampleTest, BatchesHoldTheSamplesOfTheLatencyNoneLostNoneTwice) {
    for (uint32_t t = 1; t <= 300; ++t) sensor_doubles::QueueRangeData(RangeFrame(t));
    const int32_t pusher = Open(kRange);
    EXPECT_GT(pusher, 0);
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
    std::shared_ptr<RecordingCallback> callback;
    const int32_t pusher = StartHoldingClient(&callback);
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
    const int32_t poller = Open(kRange);
    const int32_t batched = Open(kRange);
    const int32_t direct = Open(kRange);
    for (int32_t handle : {poller, batched, direct}) EXPECT_GT(handle, 0);
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
    const int32_t polling = Open(kRange);
    const int32_t timed = Open(kRange);
    for (int32_t handle : {polling, timed}) EXPECT_GT(handle, 0);
    auto callback = SetCallbackOk(timed);
    constexpr int32_t kUnknown = 12345;

    EXPECT_EQ(EnableOnSample(kUnknown, 10, 0), -38);
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_ERROR, "EnableOnSample invalid handle 12345"));
    EXPECT_EQ(Flush(kUnknown), -38);
    EXPECT_EQ(EnableOnSample(polling, 10, -1), -22) << "a negative latency";
    EXPECT_EQ(EnableOnSample(polling, 10, 300), -22) << "nothing to hand a batch to";
    EXPECT_EQ(Flush(polling), -22) << "not enabled";
    EXPECT_EQ(EnableOnSample(timed, 10, kNeverDue + 1), -22) << "past the longest latency";

    // Enabled the version 1 way: a timer loop, nothing held, nothing to flush.
    EXPECT_EQ(0, Enable(timed, 10));
    EXPECT_EQ(Flush(timed), -22);
    EXPECT_EQ(EnableOnSample(timed, 10, 0), -17);
    EXPECT_EQ(callback->Flushes().size(), 0u);
}

TEST_F(OnSampleTest, DisableEndsTheDeliveryThread) {
    const auto [poller, pusher, callback] = StartPollerAndPusher();
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
    const auto [poller, pusher, callback] = StartPollerAndPusher();
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
    const int32_t poller = Open(kRange);
    EXPECT_GT(poller, 0);
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

// A client whose OnEventBatch takes three of its periods falls behind for a while and catches up:
// the samples stored meanwhile wait in its queue.
TEST_F(OnSampleTest, ASlowBatchReceiverGetsEverySampleInOrder) {
    QueueNumberedFrames(1, 3000, 1);
    const int32_t pusher = Open(kRange);
    EXPECT_GT(pusher, 0);
    auto callback = SetCallbackOk(pusher);
    callback->SetBatchReaction([] { std::this_thread::sleep_for(milliseconds(30)); });
    ASSERT_EQ(EnableOnSample(pusher, 10, 100), 0);
    ASSERT_TRUE(callback->WaitForBatches(6, 3 * kWait));
    ASSERT_TRUE(callback->StopReacting(kWait));
    service_->Disable(pusher);

    const std::vector<Event> events = callback->Events();
    EXPECT_TRUE(Consecutive(events));
    EXPECT_GT(events.size(), callback->BatchSizes().size()) << "samples are held";
}

// A client stuck in OnEvent for 2 s at 10 ms: the sampling loop and the other clients go on, and
// it loses its oldest samples beyond its queue, counted in the dump and warned of once.
TEST_F(OnSampleTest, AClientBlockedInOnEventLosesOnlyItsOwnOldestSamples) {
    QueueNumberedFrames(1, 5000, 1);
    const int32_t stuck = Open(kRange);
    const int32_t other = Open(kRange);
    for (int32_t handle : {stuck, other}) EXPECT_GT(handle, 0);
    auto stuck_callback = SetCallbackOk(stuck);
    auto other_callback = SetCallbackOk(other);
    std::atomic<size_t> other_during{0};
    std::atomic<uint64_t> stored_during{0};
    stuck_callback->SetReaction([&](size_t count) {
        if (count != 1) return;
        const size_t other_before = other_callback->Count();
        const uint64_t stored_before = SamplesStored();
        // At least 2 s, and past the queue (100 records at 10 ms) with room to spare.
        const auto until = std::chrono::steady_clock::now() + std::chrono::seconds(2);
        const auto give_up = until + 3 * kWait;
        while (std::chrono::steady_clock::now() < until || SamplesStored() < stored_before + 150) {
            if (std::chrono::steady_clock::now() > give_up) break;
            std::this_thread::sleep_for(milliseconds(10));
        }
        other_during = other_callback->Count() - other_before;
        stored_during = SamplesStored() - stored_before;
    });
    ASSERT_EQ(EnableOnSample(stuck, 10, 0), 0);
    ASSERT_EQ(EnableOnSample(other, 10, 0), 0);
    ASSERT_TRUE(stuck_callback->WaitForEvents(2, 4 * kWait)) << "it never went on";
    ASSERT_TRUE(stuck_callback->StopReacting(kWait));

    EXPECT_GE(stored_during.load(), 150u) << "the sampling loop waited";
    EXPECT_GT(other_during.load(), 0u) << "the other client waited";
    const nlohmann::json stuck_client = ClientInDump(stuck);
    const nlohmann::json other_client = ClientInDump(other);
    EXPECT_GT(stuck_client["samples_dropped"].get<uint64_t>(), 0u) << stuck_client;
    EXPECT_EQ(other_client["samples_dropped"], 0) << other_client;
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_WARN,
                         "handle " + std::to_string(stuck) +
                             " is slower than its samples: the oldest of 100 queued are dropped"),
              1u);
    service_->Disable(stuck);
    service_->Disable(other);
    const std::vector<int64_t> timestamps = Timestamps(stuck_callback->Events());
    for (size_t i = 1; i < timestamps.size(); ++i) {
        EXPECT_GT(timestamps[i], timestamps[i - 1]) << "in order, none twice";
    }
    EXPECT_TRUE(Consecutive(other_callback->Events()));
}

// Four-zone frames at 1 ms with the longest latency: batches are handed over at their byte budget,
// none larger, and nothing is lost.
TEST_F(OnSampleTest, FourZonesAtTheLongestLatencyComeInBatchesUnderTheBudget) {
    QueueNumberedFrames(1, 6000, 4);
    const int32_t pusher = Open(kRange);
    EXPECT_GT(pusher, 0);
    auto callback = SetCallbackOk(pusher);
    ASSERT_EQ(EnableOnSample(pusher, 1, kNeverDue), 0);
    ASSERT_TRUE(callback->WaitForBatches(3, 3 * kWait));
    service_->Disable(pusher);

    const std::vector<Event> events = callback->Events();
    EXPECT_TRUE(Consecutive(events));
    size_t at = 0;
    for (size_t size : callback->BatchSizes()) {
        const std::vector<Event> batch(events.begin() + at, events.begin() + at + size);
        EXPECT_LE(vyr_test::EventsParcelBytes(batch), kBatchBudgetBytes);
        EXPECT_GT(vyr_test::EventsParcelBytes(batch), kBatchBudgetBytes / 2)
            << "handed over at the budget";
        at += size;
    }
}

// A Flush answered 0 is completed although Disable stops the client while its batch is being
// delivered.
TEST_F(OnSampleTest, AFlushIsCompletedWhenDisableComesDuringItsBatch) {
    std::shared_ptr<RecordingCallback> callback;
    const int32_t pusher = StartHoldingClient(&callback);
    Publish(1);
    ASSERT_TRUE(WaitUntilTaken(pusher));
    std::promise<void> entered;
    std::promise<void> release;
    std::shared_future<void> released = release.get_future().share();
    callback->SetBatchReaction([&entered, released] {
        entered.set_value();
        released.wait();
    });
    ASSERT_EQ(Flush(pusher), 0);
    ASSERT_EQ(entered.get_future().wait_for(kWait), std::future_status::ready);
    std::future<void> disabled =
        std::async(std::launch::async, [this, pusher] { service_->Disable(pusher); });
    ASSERT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO,
                             "DisableInternal handle " + std::to_string(pusher) + ", mode 3",
                             kWait));
    release.set_value();
    ASSERT_EQ(disabled.wait_for(kWait), std::future_status::ready);
    on_sample_.erase(pusher);
    EXPECT_EQ(callback->BatchSizes(), (std::vector<size_t>{1}));
    EXPECT_EQ(callback->Flushes(), (std::vector<size_t>{1})) << "the completion after the batch";
}

// Close right after Flush: the flush is still completed, after what was held.
TEST_F(OnSampleTest, AFlushIsCompletedWhenCloseFollowsAtOnce) {
    std::shared_ptr<RecordingCallback> callback;
    const int32_t pusher = StartHoldingClient(&callback);
    Publish(1);
    Publish(2);
    ASSERT_TRUE(WaitUntilTaken(pusher));
    ASSERT_EQ(Flush(pusher), 0);
    service_->Disable(pusher);
    service_->Close(pusher);
    on_sample_.erase(pusher);
    EXPECT_EQ(Timestamps(callback->Events()), (std::vector<int64_t>{1, 2}));
    EXPECT_EQ(callback->Flushes(), (std::vector<size_t>{2}));
}

// When the active period shrinks from 100 ms to 10 ms, the next sample of a 100 ms client is the
// first one 100 ms after its last, not the tenth one after the change.
TEST_F(OnSampleTest, TheStrideFollowsTimeWhenTheActivePeriodShrinks) {
    const int32_t poller = Open(kRange);
    const int32_t pusher = Open(kRange);
    const int32_t fast = Open(kRange);
    for (int32_t handle : {poller, pusher, fast}) EXPECT_GT(handle, 0);
    auto callback = SetCallbackOk(pusher);
    sensor_doubles::SetRangeData(RangeFrame(0));
    StartHeldSampling(poller, kRange, 100);
    ASSERT_EQ(EnableOnSample(pusher, 100, 0), 0);
    Publish(1);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));
    const auto first_stored = std::chrono::steady_clock::now();
    EXPECT_EQ(0, Enable(fast, 10));
    ASSERT_TRUE(WaitForActivePeriod(10));
    // A whole client period after the first sample; the mode has sampled once since, at 10 ms.
    std::this_thread::sleep_until(first_stored + milliseconds(100));
    Publish(2);
    ASSERT_TRUE(callback->WaitForEvents(2, kWait));
    for (uint32_t t = 3; t <= 12; ++t) Publish(t);
    ASSERT_TRUE(callback->WaitForEvents(3, kWait));
    EXPECT_EQ(Timestamps(callback->Events()), (std::vector<int64_t>{1, 2, 12}));
}

}  // namespace
}  // namespace vyr_test::datapath
