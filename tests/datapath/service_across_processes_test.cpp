// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service on the sensor doubles in a process of its own, reached through the binder NDK
// alone: open, enable, poll, callbacks, calls nested in OnEvent, the death of a client, and the
// client library's re-attach across a restart of the service. The same suite runs against a
// device's libbinder_ndk (the module vyr_service_ndk_tests).

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vyr/sample_ring_reader.h>
#include <vyr/sensor_client.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <filesystem>
#include <functional>
#include <future>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "child_process.h"
#include "doubles_service_fixture.h"
#include "recording_callback.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;

// What the client library told the application.
class Listener : public vyr::SensorClientListener {
  public:
    void OnEvent(const Event& /*event*/) override { Add(&events_); }
    void OnResumed(int32_t /*old_handle*/, int32_t /*new_handle*/, milliseconds /*since*/) override {
        Add(&resumed_);
    }
    bool WaitForEvents(int count) { return WaitFor(&events_, count); }
    bool WaitForResumed(int count) { return WaitFor(&resumed_, count); }
    int events() {
        std::lock_guard<std::mutex> lock(mutex_);
        return events_;
    }

  private:
    void Add(int* counter) {
        {
            std::lock_guard<std::mutex> lock(mutex_);
            ++*counter;
        }
        changed_.notify_all();
    }
    bool WaitFor(int* counter, int count) {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kDeadline, [&] { return *counter >= count; });
    }
    std::mutex mutex_;
    std::condition_variable changed_;
    int events_ = 0;
    int resumed_ = 0;
};

TEST_F(ServiceAcrossProcessesTest, OpenEnablePollDisableClose) {
    const int32_t handle = OpenRange();
    EnableAt(handle, 20);
    EXPECT_TRUE(Eventually([&] { return Poll(handle) == 0; })) << "no sample polled";
    ASSERT_TRUE(service_->Disable(handle).isOk());
    ASSERT_TRUE(service_->Close(handle).isOk());
    EXPECT_EQ(Poll(handle), -EINVAL);
}

TEST_F(ServiceAcrossProcessesTest, ACallbackGetsTheSamplesPushed) {
    const int32_t handle = OpenRange();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = -1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_EQ(result, 0);
    EnableAt(handle, 20);
    EXPECT_TRUE(callback->WaitForEvents(3, kDeadline));
    ASSERT_TRUE(service_->Disable(handle).isOk());
    ASSERT_TRUE(service_->Close(handle).isOk());
}

// A client that calls the service from its OnEvent (the notification thread waits for the reply
// meanwhile) is served, and its events go on. Its nested calls end before it disables, as they
// must for a client enabled with Enable.
TEST_F(ServiceAcrossProcessesTest, CallsFromOnEventAreServed) {
    const int32_t handle = OpenRange();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    std::atomic<int> nested_ok{0};
    std::shared_ptr<IVYRService> service = service_;
    callback->SetReaction([service, handle, &nested_ok](size_t /*count*/) {
        Event event;
        int32_t result = 0;
        if (service->PollOnce(handle, &event, &result).isOk()) ++nested_ok;
    });
    int32_t result = -1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    EnableAt(handle, 20);
    EXPECT_TRUE(callback->WaitForEvents(5, kDeadline));
    ASSERT_TRUE(callback->StopReacting(kDeadline));
    ASSERT_TRUE(service_->Disable(handle).isOk());
    ASSERT_TRUE(service_->Close(handle).isOk());
    EXPECT_GE(nested_ok.load(), 4);
}

// The service releases the handle of a client whose process dies.
TEST_F(ServiceAcrossProcessesTest, TheDeathOfAClientReleasesItsHandle) {
    ChildProcess client({DoublesService(), "client", name_}, {}, dir_ + "/client.log");
    std::optional<std::string> line = client.ReadLineStartingWith("handle ", kDeadline);
    ASSERT_TRUE(line) << "the client never enabled";
    const int32_t handle = atoi(line->c_str() + 7);
    ASSERT_GT(handle, 0);
    EXPECT_NE(Poll(handle), -EINVAL);
    client.Signal(SIGKILL);
    ASSERT_TRUE(client.Wait(kDeadline));
    EXPECT_TRUE(Eventually([&] { return Poll(handle) == -EINVAL; })) << "the handle outlived it";
}

// The binding is of the newest frozen version, which a client asks for before it uses a method
// of that version.
TEST_F(ServiceAcrossProcessesTest, TheServiceReportsInterfaceVersion3) {
    int32_t version = 0;
    ASSERT_TRUE(service_->getInterfaceVersion(&version).isOk());
    EXPECT_EQ(version, 3);
    EXPECT_EQ(int32_t{IVYRService::version}, 3);
}

// A ring client reads every sample the service stores, in order, from shared memory: the frames
// of the doubles are numbered by their time, one apart.
TEST_F(ServiceAcrossProcessesTest, ARingClientReadsEverySampleInOrderWithNoCallPerSample) {
    const int32_t handle = OpenRange();
    ndk::ScopedFileDescriptor fd;
    int32_t result = -1;
    ASSERT_TRUE(service_->EnableRing(handle, 1, &fd, &result).isOk());
    ASSERT_EQ(result, 0);
    std::string error;
    std::unique_ptr<vyr::SampleRingReader> ring = vyr::SampleRingReader::Map(std::move(fd), &error);
    ASSERT_NE(ring, nullptr) << error;
    EXPECT_EQ(ring->mode(), kRangeMode);
    vyr::RingSample sample;
    const auto deadline = std::chrono::steady_clock::now() + kDeadline;
    ASSERT_EQ(ring->WaitNewer(0, deadline, &sample), vyr::SampleRingReader::WaitResult::kOk);
    uint64_t seq = sample.seq;
    int64_t timestamp = sample.timestamp;
    for (int i = 0; i < 200; ++i) {
        ASSERT_EQ(ring->WaitNewer(seq, deadline, &sample), vyr::SampleRingReader::WaitResult::kOk);
        EXPECT_EQ(sample.seq, seq + 1) << "records were overwritten before they were read";
        EXPECT_EQ(sample.timestamp, timestamp + 1) << "a sample went missing at seq " << sample.seq;
        EXPECT_EQ(sample.data_count, 21u) << "10 header values and one zone's 11";
        seq = sample.seq;
        timestamp = sample.timestamp;
    }
    ASSERT_TRUE(service_->Disable(handle).isOk());
    ASSERT_TRUE(service_->Close(handle).isOk());
}

// A client that dies with the ring mapped is released as any other, and the ring is written no
// more, though the mode samples on for a polling client.
TEST_F(ServiceAcrossProcessesTest, TheDeathOfARingClientReleasesItAndEndsTheWriting) {
    ChildProcess client({DoublesService(), "ring", name_}, {}, dir_ + "/client.log");
    std::optional<std::string> line = client.ReadLineStartingWith("handle ", kDeadline);
    ASSERT_TRUE(line) << "the client never enabled";
    const int32_t handle = atoi(line->c_str() + 7);
    ASSERT_GT(handle, 0);
    // This process's view of the same ring, through a handle of its own enabled and disabled.
    const int32_t viewer = OpenRange();
    ndk::ScopedFileDescriptor fd;
    int32_t result = -1;
    ASSERT_TRUE(service_->EnableRing(viewer, 1, &fd, &result).isOk());
    ASSERT_EQ(result, 0);
    ASSERT_TRUE(service_->Disable(viewer).isOk());
    std::string error;
    std::unique_ptr<vyr::SampleRingReader> ring = vyr::SampleRingReader::Map(std::move(fd), &error);
    ASSERT_NE(ring, nullptr) << error;
    const uint64_t before = ring->LastSeq();
    EXPECT_TRUE(Eventually([&] { return ring->LastSeq() > before + 10; })) << "not written";

    const int32_t poller = OpenRange();
    EnableAt(poller, 1);
    client.Signal(SIGKILL);
    ASSERT_TRUE(client.Wait(kDeadline));
    EXPECT_TRUE(Eventually([&] { return Poll(handle) == -EINVAL; })) << "the handle outlived it";
    const uint64_t frozen = ring->LastSeq();
    // Samples go on being stored for the poller: fresh ones come, the ring stays as it was.
    int fresh = 0;
    EXPECT_TRUE(Eventually([&] { return Poll(poller) == 0 && ++fresh >= 20; }));
    EXPECT_EQ(ring->LastSeq(), frozen) << "written for a dead client";
    ASSERT_TRUE(service_->Disable(poller).isOk());
    ASSERT_TRUE(service_->Close(poller).isOk());
    ASSERT_TRUE(service_->Close(viewer).isOk());
}

// One callback object set on two handles: its process's death releases both, whichever handle's
// link was made first, and the table has room for ten clients again.
class SharedCallbackDeathTest : public ServiceAcrossProcessesTest,
                                public ::testing::WithParamInterface<const char*> {};

TEST_P(SharedCallbackDeathTest, ReleasesBothHandles) {
    ChildProcess client({DoublesService(), "shared", name_, GetParam()}, {}, dir_ + "/client.log");
    std::optional<std::string> line = client.ReadLineStartingWith("handles ", kDeadline);
    ASSERT_TRUE(line) << "the client never enabled";
    int32_t a = 0;
    int32_t b = 0;
    ASSERT_EQ(sscanf(line->c_str(), "handles %d %d", &a, &b), 2);
    EXPECT_NE(Poll(a), -EINVAL);
    EXPECT_NE(Poll(b), -EINVAL);
    client.Signal(SIGKILL);
    ASSERT_TRUE(client.Wait(kDeadline));
    EXPECT_TRUE(Eventually([&] { return Poll(a) == -EINVAL; })) << "handle " << a << " outlived it";
    EXPECT_TRUE(Eventually([&] { return Poll(b) == -EINVAL; })) << "handle " << b << " outlived it";
    std::vector<int32_t> opened;
    for (int i = 0; i < 10; ++i) opened.push_back(OpenRange());
    for (int32_t handle : opened) ASSERT_TRUE(service_->Close(handle).isOk());
    EXPECT_TRUE(server_->Running());
}

INSTANTIATE_TEST_SUITE_P(LinkOrders, SharedCallbackDeathTest, ::testing::Values("first", "second"));

// The client library re-attaches to the next instance of the service and its events resume.
TEST_F(ServiceAcrossProcessesTest, TheClientLibraryReattachesAcrossARestart) {
    vyr::SensorSettings settings;
    settings.mode = kRangeMode;
    settings.period_ms = 20;
    settings.use_callback = true;
    vyr::ReattachPolicy policy;
    policy.service_name = name_;
    Listener listener;
    vyr::SensorClient client(settings, &listener, policy);
    ASSERT_EQ(client.Start(service_), 0);
    ASSERT_TRUE(listener.WaitForEvents(3));
    service_.reset();
    KillService();
    StartService();
    ASSERT_TRUE(listener.WaitForResumed(1)) << "never re-attached";
    const int before = listener.events();
    EXPECT_TRUE(listener.WaitForEvents(before + 3)) << "no events from the new instance";
    client.Stop();
    EXPECT_EQ(client.state(), vyr::SensorClient::State::kStopped);
}

// A client enabled with Enable that calls the service from OnEvent while another of its threads
// disables the handle: Disable waits for OnEvent under the service's lock, the nested call waits
// for that lock, and 10 s later the service's lock check ends the service.
TEST_F(ServiceAcrossProcessesTest, AVersion1NestedCallBesideADisableEndsTheService) {
    const int32_t handle = OpenRange();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    Gate disabling;
    std::atomic<bool> nested_failed{false};
    std::shared_ptr<IVYRService> service = service_;
    callback->SetReaction([service, handle, &disabling, &nested_failed](size_t count) {
        if (count != 1 || !disabling.Wait(kDeadline)) return;
        // Calls back until the service can no longer answer.
        const auto give_up = std::chrono::steady_clock::now() + 3 * kDeadline;
        Event event;
        int32_t result = 0;
        while (std::chrono::steady_clock::now() < give_up) {
            if (!service->PollOnce(handle, &event, &result).isOk()) {
                nested_failed = true;
                return;
            }
            std::this_thread::sleep_for(milliseconds(1));
        }
    });
    int32_t result = -1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    EnableAt(handle, 20);
    ASSERT_TRUE(callback->WaitForEvents(1, kDeadline));
    auto disabled = std::async(std::launch::async, [&] {
        disabling.Open();
        return service->Disable(handle).isOk();
    });
    ASSERT_EQ(disabled.wait_for(3 * kDeadline), std::future_status::ready)
        << "Disable never returned";
    EXPECT_FALSE(disabled.get()) << "the service answered Disable";
    const std::optional<int> status = server_->Wait(kDeadline);
    ASSERT_TRUE(status.has_value()) << "the service still runs";
    EXPECT_TRUE(WIFSIGNALED(*status) && WTERMSIG(*status) == SIGABRT) << "wait status " << *status;
    EXPECT_TRUE(callback->StopReacting(kDeadline));
    EXPECT_TRUE(nested_failed.load());
}

// Which callback of a client enabled on sample makes the nested calls.
enum class NestedFrom { kOnEvent, kOnEventBatch, kOnFlushComplete };

class NestedOnSampleTest : public ServiceAcrossProcessesTest,
                           public ::testing::WithParamInterface<NestedFrom> {
  protected:
    // One of the calls that a callback makes back, by `turn`; only its status is asked for.
    static bool CallBack(IVYRService& service, int32_t handle, int turn) {
        int32_t result = 0;
        switch (turn % 3) {
            case 0: {
                Event event;
                return service.PollOnce(handle, &event, &result).isOk();
            }
            case 1:
                return service.EnableLowPower(handle, false, &result).isOk();
            default:
                return service.ConfigureParameters(handle, std::vector<int32_t>(11, 1), &result)
                    .isOk();
        }
    }

    // Enables `handle` on sample so that the callback under test runs, setting `react` as its
    // reaction.
    void EnableSoThatItRuns(int32_t handle, RecordingCallback& callback,
                            const std::function<void()>& react) {
        int32_t result = -1;
        switch (GetParam()) {
            case NestedFrom::kOnEvent:
                callback.SetReaction([react](size_t /*count*/) { react(); });
                ASSERT_TRUE(service_->EnableOnSample(handle, 1, 0, &result).isOk());
                ASSERT_EQ(result, 0);
                break;
            case NestedFrom::kOnEventBatch:
                callback.SetBatchReaction(react);
                ASSERT_TRUE(service_->EnableOnSample(handle, 1, 5, &result).isOk());
                ASSERT_EQ(result, 0);
                break;
            case NestedFrom::kOnFlushComplete:
                callback.SetFlushReaction(react);
                ASSERT_TRUE(service_->EnableOnSample(handle, 1, 60000, &result).isOk());
                ASSERT_EQ(result, 0);
                ASSERT_TRUE(service_->Flush(handle, &result).isOk());
                ASSERT_EQ(result, 0);
                break;
        }
    }
};

// A version 2 callback that calls back while another thread of its client disables and closes
// the handle holds only that client's calls: the service never waits for it under its lock, and
// a second client is served all along.
TEST_P(NestedOnSampleTest, NestedCallsBesideADisableAndCloseAreServed) {
    const int32_t other = OpenRange();
    std::shared_ptr<IVYRService> service = service_;
    for (int round = 0; round < 50; ++round) {
        SCOPED_TRACE("round " + std::to_string(round));
        const int32_t handle = OpenRange();
        auto callback = ndk::SharedRefBase::make<RecordingCallback>();
        int32_t result = -1;
        ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
        Gate entered;
        Gate disabling;
        std::atomic<bool> first{true};
        std::atomic<int> nested_failures{0};
        EnableSoThatItRuns(handle, *callback, [&, handle, round] {
            if (!first.exchange(false)) return;
            entered.Open();
            if (!disabling.Wait(kDeadline)) return;
            // Calls back for a while beside the Disable.
            const auto until = std::chrono::steady_clock::now() + milliseconds(20);
            int turn = round;
            do {
                if (!CallBack(*service, handle, turn++)) ++nested_failures;
            } while (std::chrono::steady_clock::now() < until);
        });
        ASSERT_TRUE(entered.Wait(kDeadline)) << "the callback never ran";
        auto released = std::async(std::launch::async, [&] {
            disabling.Open();
            return service->Disable(handle).isOk() && service->Close(handle).isOk();
        });
        // The other client meanwhile.
        int turn = round;
        while (released.wait_for(milliseconds(1)) != std::future_status::ready) {
            ASSERT_TRUE(CallBack(*service, other, turn++)) << "the second client was refused";
            ASSERT_TRUE(server_->Running()) << "the service ended";
        }
        EXPECT_TRUE(released.get()) << "Disable or Close failed";
        EXPECT_TRUE(callback->StopReacting(kDeadline));
        EXPECT_EQ(nested_failures.load(), 0);
    }
    EXPECT_NE(Poll(other), -EINVAL) << "the second client is still open";
    ASSERT_TRUE(server_->Running());
}

INSTANTIATE_TEST_SUITE_P(EveryCallback, NestedOnSampleTest,
                         ::testing::Values(NestedFrom::kOnEvent, NestedFrom::kOnEventBatch,
                                           NestedFrom::kOnFlushComplete),
                         [](const ::testing::TestParamInfo<NestedFrom>& info) {
                             switch (info.param) {
                                 case NestedFrom::kOnEvent:
                                     return std::string("OnEvent");
                                 case NestedFrom::kOnEventBatch:
                                     return std::string("OnEventBatch");
                                 default:
                                     return std::string("OnFlushComplete");
                             }
                         });

// A version 2 callback that takes 15 s while its client disables: only that Disable waits, and
// the service, which would end itself after 10 s of waiting for its lock, serves a second client
// throughout.
TEST_F(ServiceAcrossProcessesTest, ASlowOnSampleCallbackHoldsOnlyItsOwnDisable) {
    const int32_t other = OpenRange();
    const int32_t handle = OpenRange();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    callback->SetReaction([](size_t count) {
        if (count == 1) std::this_thread::sleep_for(std::chrono::seconds(15));
    });
    int32_t result = -1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_TRUE(service_->EnableOnSample(handle, 20, 0, &result).isOk());
    ASSERT_EQ(result, 0);
    ASSERT_TRUE(callback->WaitForEvents(1, kDeadline));
    std::shared_ptr<IVYRService> service = service_;
    auto released = std::async(std::launch::async, [service, handle] {
        return service->Disable(handle).isOk() && service->Close(handle).isOk();
    });
    int turn = 0;
    while (released.wait_for(milliseconds(10)) != std::future_status::ready) {
        Event event;
        ASSERT_TRUE(service_->PollOnce(other, &event, &result).isOk())
            << "the second client was refused at call " << turn;
        ++turn;
    }
    EXPECT_TRUE(released.get());
    EXPECT_TRUE(callback->StopReacting(kDeadline));
    EXPECT_TRUE(server_->Running());
    EXPECT_NE(Poll(other), -EINVAL);
}

// A version 2 callback that never answers: its client's Disable waits, nothing else does, and the
// client's death releases its handle.
TEST_F(ServiceAcrossProcessesTest, AnOnSampleCallbackThatNeverAnswersHoldsOnlyItsOwnClient) {
    ChildProcess client({DoublesService(), "stuck", name_}, {}, dir_ + "/stuck.log");
    std::optional<std::string> line = client.ReadLineStartingWith("handle ", kDeadline);
    ASSERT_TRUE(line) << "the service never called the client";
    const int32_t handle = atoi(line->c_str() + 7);
    ASSERT_TRUE(client.ReadLineStartingWith("disabling", kDeadline));
    const int32_t other = OpenRange();
    // Longer than the service would wait for its lock before ending itself.
    const auto until = std::chrono::steady_clock::now() + kDeadline + std::chrono::seconds(1);
    int32_t result = 0;
    int turn = 0;
    while (std::chrono::steady_clock::now() < until) {
        Event event;
        ASSERT_TRUE(service_->PollOnce(other, &event, &result).isOk())
            << "the second client was refused at call " << turn;
        ++turn;
        std::this_thread::sleep_for(milliseconds(10));
    }
    client.Signal(SIGKILL);
    ASSERT_TRUE(client.Wait(kDeadline));
    EXPECT_TRUE(Eventually([&] { return Poll(handle) == -EINVAL; })) << "the handle outlived it";
    EXPECT_TRUE(server_->Running());
    ASSERT_TRUE(service_->Close(other).isOk());
}

}  // namespace
}  // namespace vyr_test::datapath
