// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// ConfigureParameters and SetTorchLightState, and the result code of every method for a handle
// that the service does not know.

#include <aidl/android/vyr/Event.h>
#include <android/log.h>

#include <climits>
#include <vector>

#include "data_path_fixture.h"
#include "recording_callback.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;

class ParametersTest : public DataPathTest {
  protected:
    int32_t Configure(int32_t handle, const std::vector<int32_t>& values) {
        int32_t result = 1;
        EXPECT_TRUE(service_->ConfigureParameters(handle, values, &result).isOk());
        return result;
    }
};

TEST_F(ParametersTest, ElevenValuesReachTheRangeSensorInOrder) {
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    ASSERT_EQ(Configure(handle, {11, -22, INT_MAX, INT_MIN, 1, 1, 1, 7, -8, 9, 10}), 0);

    auto calls = sensor_doubles::CallsNamed(sensor_doubles::kRangeConfigureParameters);
    ASSERT_EQ(calls.size(), 1u);
    const ControlSettings& s = calls[0].settings;
    EXPECT_EQ(s.frame_rate_hz, 11);
    EXPECT_EQ(s.timing_budget_ms, -22);
    EXPECT_EQ(s.signal_threshold, INT_MAX);
    EXPECT_EQ(s.sigma_threshold_mm, INT_MIN);
    EXPECT_TRUE(s.smudge_correction);
    EXPECT_TRUE(s.crosstalk_correction);
    EXPECT_TRUE(s.ambient_correction);
    EXPECT_EQ(s.reserved, 0);
    EXPECT_EQ(s.distance_mode, 7);
    EXPECT_EQ(s.range_min_mm, -8);
    EXPECT_EQ(s.range_max_mm, 9);
    EXPECT_EQ(s.zone_layout, 10);
}

TEST_F(ParametersTest, FlagsAreSetOnlyByExactlyOne) {
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    ASSERT_EQ(Configure(handle, {0, 0, 0, 0, 2, -1, 0, 0, 0, 0, 0}), 0);
    ASSERT_EQ(Configure(handle, {0, 0, 0, 0, 257, 1, 3, 0, 0, 0, 0}), 0);

    auto calls = sensor_doubles::CallsNamed(sensor_doubles::kRangeConfigureParameters);
    ASSERT_EQ(calls.size(), 2u);
    EXPECT_FALSE(calls[0].settings.smudge_correction);
    EXPECT_FALSE(calls[0].settings.crosstalk_correction);
    EXPECT_FALSE(calls[0].settings.ambient_correction);
    EXPECT_FALSE(calls[1].settings.smudge_correction) << "257 is not 1";
    EXPECT_TRUE(calls[1].settings.crosstalk_correction);
    EXPECT_FALSE(calls[1].settings.ambient_correction);
}

TEST_F(ParametersTest, WrongValueCountIsRefusedWithItsSize) {
    int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    EXPECT_EQ(Configure(handle, std::vector<int32_t>(10, 1)), -22);
    EXPECT_EQ(Configure(handle, std::vector<int32_t>(12, 1)), -22);
    EXPECT_EQ(Configure(handle, {}), -22);
    EXPECT_EQ(
        log_.Count(kTag, ANDROID_LOG_ERROR, "ConfigureParameters data size 10 is not equal to 11"),
        1u);
    EXPECT_EQ(
        log_.Count(kTag, ANDROID_LOG_ERROR, "ConfigureParameters data size 12 is not equal to 11"),
        1u);
    EXPECT_EQ(
        log_.Count(kTag, ANDROID_LOG_ERROR, "ConfigureParameters data size 0 is not equal to 11"),
        1u);
    EXPECT_EQ(sensor_doubles::CountOf(sensor_doubles::kRangeConfigureParameters), 0u);
}

TEST_F(ParametersTest, LightClientCannotConfigure) {
    int32_t handle = Open(kAls);
    EXPECT_GT(handle, 0);
    EXPECT_EQ(Configure(handle, std::vector<int32_t>(11, 0)), -22);
    EXPECT_EQ(Configure(handle, std::vector<int32_t>(3, 0)), -22);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_ERROR, "ConfigureParameters, mode 1 is not supported"),
              2u);
    EXPECT_EQ(sensor_doubles::CountOf(sensor_doubles::kRangeConfigureParameters), 0u);
}

TEST_F(ParametersTest, UnknownHandleCannotConfigure) {
    EXPECT_EQ(Configure(4242, std::vector<int32_t>(11, 0)), -38);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_ERROR, "ConfigureParameters invalid handle 4242"), 1u);
    EXPECT_EQ(sensor_doubles::CountOf(sensor_doubles::kRangeConfigureParameters), 0u);
}

TEST_F(ParametersTest, TorchStateIsNarrowedToItsLowByte) {
    EXPECT_TRUE(service_->SetTorchLightState(257).isOk());
    EXPECT_TRUE(service_->SetTorchLightState(-1).isOk());
    auto calls = sensor_doubles::CallsNamed(sensor_doubles::kAlsSetTorchLightState);
    ASSERT_EQ(calls.size(), 2u);
    EXPECT_EQ(calls[0].args, std::vector<int64_t>{1});
    EXPECT_EQ(calls[1].args, std::vector<int64_t>{255});
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, "torch state changed to 257"), 1u);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, "torch state changed to -1"), 1u);
}

TEST_F(ParametersTest, TorchWithoutLightSensorDoesNothing) {
    MakeService(false);
    log_.Clear();
    EXPECT_TRUE(service_->SetTorchLightState(1).isOk());
    EXPECT_EQ(sensor_doubles::CountOf(sensor_doubles::kAlsSetTorchLightState), 0u);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, "torch state changed to 1"), 0u);
}

TEST_F(ParametersTest, UnknownHandleResultPerMethod) {
    constexpr int32_t kUnknown = 31337;
    int32_t result = 0;
    EXPECT_TRUE(service_->Enable(kUnknown, 100, &result).isOk());
    EXPECT_EQ(result, -38);
    EXPECT_TRUE(service_->EnableLowPower(kUnknown, true, &result).isOk());
    EXPECT_EQ(result, -38);
    EXPECT_TRUE(
        service_->SetCallback(kUnknown, ndk::SharedRefBase::make<RecordingCallback>(), &result)
            .isOk());
    EXPECT_EQ(result, -22);
    Event event{};
    EXPECT_TRUE(service_->PollOnce(kUnknown, &event, &result).isOk());
    EXPECT_EQ(result, -22);
    EXPECT_TRUE(
        service_->ConfigureParameters(kUnknown, std::vector<int32_t>(11, 0), &result).isOk());
    EXPECT_EQ(result, -38);
    EXPECT_TRUE(service_->Disable(kUnknown).isOk());
    EXPECT_TRUE(service_->Close(kUnknown).isOk());

    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_ERROR, "Enable invalid handle 31337"), 1u);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_ERROR, "EnableLowPower invalid handle 31337"), 1u);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_WARN, "SetCallback invalid handle 31337"), 1u);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_WARN, "DisableInternal invalid handle 31337"), 1u);
    // Nothing was queued for a worker.
    EXPECT_EQ(sensor_doubles::CountOf(sensor_doubles::kRangeInit), 0u);
}

TEST_F(ParametersTest, LowPowerIsRefusedForRangeClients) {
    int32_t range = Open(kRange);
    int32_t light = Open(kAls);
    for (int32_t handle : {range, light}) EXPECT_GT(handle, 0);
    int32_t result = 0;
    EXPECT_TRUE(service_->EnableLowPower(range, true, &result).isOk());
    EXPECT_EQ(result, -22);
    EXPECT_TRUE(service_->EnableLowPower(light, true, &result).isOk());
    EXPECT_EQ(result, 0);
}

}  // namespace
}  // namespace vyr_test::datapath
