// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>

#include <cstdlib>
#include <set>

#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_fixture.h"
#include "thread_count.h"
#include "vyrservice_test_peer.h"

namespace vyr_test::service {
namespace {

using aidl::android::vyr::Event;

using OpenCloseTest = ServiceFixture;

TEST_F(OpenCloseTest, InvalidModesAreRefused) {
    MakeService();
    for (int32_t mode : {2, 0, -1}) {
        int32_t result = 0;
        EXPECT_TRUE(service_->Open(mode, &result).isOk());
        EXPECT_EQ(-22, result) << "mode " << mode;
        EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_ERROR,
                                 "Open invalid sensor mode: " + std::to_string(mode)));
    }
}

TEST_F(OpenCloseTest, EleventhOpenFailsUntilOneCloses) {
    MakeService();
    std::vector<int32_t> handles;
    for (int i = 0; i < 10; ++i) {
        handles.push_back(Open(i % 2 == 0 ? 1 : 3));
        EXPECT_GT(handles.back(), 0);
    }
    EXPECT_EQ(10u, std::set<int32_t>(handles.begin(), handles.end()).size());
    EXPECT_EQ(-1, Open(1));
    EXPECT_EQ(-1, Open(3));
    EXPECT_EQ(2u, log_.Count(kTag, ANDROID_LOG_ERROR, "Open max client number reached"));

    EXPECT_TRUE(service_->Close(handles[4]).isOk());
    EXPECT_GT(Open(3), 0);
    EXPECT_EQ(-1, Open(1));
}

TEST_F(OpenCloseTest, FullTableIsReportedBeforeMissingSensor) {
    MakeService(/*als=*/true, /*range=*/false);
    for (int i = 0; i < 10; ++i) EXPECT_GT(Open(1), 0);
    EXPECT_EQ(-1, Open(3));
    EXPECT_EQ(0u, log_.Count(kTag, ANDROID_LOG_ERROR, "Open vyr range sensor unavailable"));
}

TEST_F(OpenCloseTest, InvalidModeIsReportedBeforeFullTable) {
    MakeService();
    for (int i = 0; i < 10; ++i) EXPECT_GT(Open(3), 0);
    EXPECT_EQ(-22, Open(2));
    EXPECT_EQ(0u, log_.Count(kTag, ANDROID_LOG_ERROR, "Open max client number reached"));
}

TEST_F(OpenCloseTest, MissingSensorsAreRefused) {
    MakeService(/*als=*/false, /*range=*/false);
    EXPECT_EQ(-19, Open(1));
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_ERROR, "Open als sensor unavailable"));
    EXPECT_EQ(-19, Open(3));
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_ERROR, "Open vyr range sensor unavailable"));
}

TEST_F(OpenCloseTest, OpenTouchesNoSensorAndStartsNoThread) {
    MakeService();
    const size_t threads = ThreadCount();
    const size_t calls = sensor_doubles::Calls().size();
    EXPECT_GT(Open(1), 0);
    EXPECT_GT(Open(3), 0);
    EXPECT_EQ(threads, ThreadCount());
    EXPECT_EQ(calls, sensor_doubles::Calls().size());
}

TEST_F(OpenCloseTest, CloseOfUnknownOrClosedHandleChangesNothing) {
    MakeService();
    const int32_t handle = Open(3);
    ASSERT_GT(handle, 0);
    log_.Clear();
    EXPECT_TRUE(service_->Close(handle == 12345 ? 12346 : 12345).isOk());
    EXPECT_TRUE(service_->Close(handle).isOk());
    EXPECT_TRUE(service_->Close(handle).isOk());
    EXPECT_TRUE(log_.Records().empty());
    // The count of open clients fell by exactly one: ten more opens fit, the eleventh does not.
    for (int i = 0; i < 10; ++i) EXPECT_GT(Open(1), 0);
    EXPECT_EQ(-1, Open(1));
}

TEST_F(OpenCloseTest, ClosedHandleIsUnknownToEveryMethod) {
    MakeService();
    const int32_t handle = Open(3);
    ASSERT_TRUE(service_->Close(handle).isOk());
    int32_t result = 0;
    EXPECT_TRUE(service_->Enable(handle, 100, &result).isOk());
    EXPECT_EQ(-38, result);
    EXPECT_TRUE(service_->EnableLowPower(handle, true, &result).isOk());
    EXPECT_EQ(-38, result);
    EXPECT_TRUE(service_->ConfigureParameters(handle, std::vector<int32_t>(11, 0), &result).isOk());
    EXPECT_EQ(-38, result);
    Event event{};
    EXPECT_TRUE(service_->PollOnce(handle, &event, &result).isOk());
    EXPECT_EQ(-22, result);
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    EXPECT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    EXPECT_EQ(-22, result);
}

TEST_F(OpenCloseTest, CloseOfEnabledClientEndsNotificationButKeepsEnableCount) {
    // A failing Init keeps the processing thread from starting, so the raised count that Close
    // leaves behind does not leave a sampling thread running at the end of the test.
    sensor_doubles::SetResult(sensor_doubles::kRangeInit, -1);
    MakeService();
    const int32_t handle = Open(3);
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_EQ(0, result);
    const size_t idle_threads = ThreadCount();
    ASSERT_EQ(0, Enable(handle, 100));
    ASSERT_TRUE(WaitForWorkLog("EnableWork", handle));
    EXPECT_EQ(idle_threads + 1, ThreadCount());  // the notification thread

    EXPECT_TRUE(service_->Close(handle).isOk());
    EXPECT_TRUE(WaitForThreadCount(idle_threads, kWait)) << vyr_test::ThreadNames();
    EXPECT_EQ(1, callback.use_count());

    const auto block = ServicePeer::SnapshotModeBlock(*service_, 2);
    EXPECT_EQ(1, block.enable_count);
    EXPECT_TRUE(block.running);
    EXPECT_EQ(1u, block.periods.count(handle));
    EXPECT_EQ(0u, sensor_doubles::CountOf(sensor_doubles::kRangeUninit));
}

TEST_F(OpenCloseTest, EmptyCallbackIsRefused) {
    MakeService(false, true);
    const int32_t handle = Open(3);
    int32_t result = 0;
    EXPECT_TRUE(service_->SetCallback(handle, nullptr, &result).isOk());
    EXPECT_EQ(-22, result);
    EXPECT_EQ(1u, log_.Count(kTag, ANDROID_LOG_ERROR, "SetCallback null callback"));
    // Still a polling client: enabling starts the processing thread and no notification thread.
    ASSERT_EQ(0, Enable(handle, 100));
    ASSERT_TRUE(WaitForWorkLog("EnableWork", handle));
    ServicePeer::SnapshotModeBlock(*service_, BlockOf(3));
    EXPECT_EQ(baseline_threads_ + 2, ThreadCount());
    DisableAndWait(handle);
}

TEST_F(OpenCloseTest, FailedCallsStillReturnOkStatus) {
    MakeService(/*als=*/false, /*range=*/true);
    int32_t result = 0;
    EXPECT_TRUE(service_->Open(7, &result).isOk());
    EXPECT_TRUE(service_->Open(1, &result).isOk());
    EXPECT_EQ(-19, result);
    EXPECT_TRUE(service_->Enable(99, 100, &result).isOk());
    EXPECT_TRUE(service_->EnableLowPower(99, false, &result).isOk());
    EXPECT_TRUE(service_->Disable(99).isOk());
    EXPECT_TRUE(service_->Close(99).isOk());
    Event event{};
    EXPECT_TRUE(service_->PollOnce(99, &event, &result).isOk());
    EXPECT_TRUE(service_->ConfigureParameters(99, {}, &result).isOk());
    EXPECT_TRUE(service_->SetTorchLightState(1).isOk());
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    EXPECT_TRUE(service_->SetCallback(99, callback, &result).isOk());
}

// glibc's unseeded generator is the one seeded with 1.
TEST_F(OpenCloseTest, HandlesFollowTheUnseededGeneratorAndSkipTheDisplayHandle) {
    srand(1);
    const int32_t display_handle = rand() + 1;
    const int32_t second_draw = rand() + 1;
    srand(1);
    MakeService();
    // The first draw for a client would repeat the display handle; it must be skipped.
    srand(1);
    EXPECT_EQ(second_draw, Open(3));
    srand(1);
    const int32_t again = Open(1);
    EXPECT_NE(display_handle, again);
    EXPECT_NE(second_draw, again);
}

TEST_F(OpenCloseTest, FirstHandleOfFreshServiceIsSecondDraw) {
    srand(1);
    rand();
    const int32_t expected = rand() + 1;
    srand(1);
    MakeService();
    EXPECT_EQ(expected, Open(1));
}

TEST_F(OpenCloseTest, ClosedHandleMayBeChosenAgain) {
    srand(1);
    MakeService();
    srand(1);
    rand();
    const int32_t first = rand() + 1;
    srand(1);
    const int32_t handle = Open(3);
    EXPECT_EQ(first, handle);
    ASSERT_TRUE(service_->Close(handle).isOk());
    srand(1);
    EXPECT_EQ(first, Open(3));
}

TEST_F(OpenCloseTest, NoModeSelectsTheMiddleBlock) {
    MakeService();
    const int32_t als = OpenAndEnable(1, 100);
    const int32_t range = OpenAndEnable(3, 200);
    const auto middle = ServicePeer::SnapshotModeBlock(*service_, 1);
    EXPECT_FALSE(middle.running);
    EXPECT_EQ(0, middle.mode);
    EXPECT_EQ(0, middle.enable_count);
    EXPECT_EQ(1000, middle.active_period);
    EXPECT_TRUE(middle.periods.empty());
    EXPECT_EQ(1, ServicePeer::SnapshotModeBlock(*service_, 0).mode);
    EXPECT_EQ(3, ServicePeer::SnapshotModeBlock(*service_, 2).mode);
    DisableAndWait(als);
    DisableAndWait(range);
    EXPECT_EQ(0, ServicePeer::SnapshotModeBlock(*service_, 1).enable_count);
}

}  // namespace
}  // namespace vyr_test::service
