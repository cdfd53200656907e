// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service of interface version 2 and a client built from the frozen version 1 (v1_client):
// every result that client sees is what version 1 gives, its events read as they always did, and
// no version 2 method reaches its callback.

#include <android/binder_process.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "child_process.h"
#include "service_process.h"
#include "shared_service_test.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;

constexpr milliseconds kWait{10000};

class Version1ClientTest : public SharedServiceTest {
  protected:
    std::unique_ptr<ChildProcess> Client(const std::string& mode) {
        auto child = std::make_unique<ChildProcess>(
            std::vector<std::string>{V1_CLIENT_PATH, mode}, process_->ClientEnvironment(),
            process_->dir() + "/v1_client-" + mode + ".log", milliseconds(5000));
        EXPECT_TRUE(child->started());
        return child;
    }
};

TEST_F(Version1ClientTest, EveryResultIsVersion1s) {
    auto client = Client("parts");
    std::vector<std::string> lines;
    while (true) {
        std::optional<std::string> line = client->ReadLine(kWait);
        ASSERT_TRUE(line) << "no line after:\n" << ::testing::PrintToString(lines);
        if (*line == "done") break;
        lines.push_back(*line);
    }
    const std::vector<std::string> expected = {
        "Open 7 -22",
        "Open 3 handle",
        "SetCallback 0",
        "Enable 0",
        "Enable again -17",
        "SetCallback enabled -1",
        "EnableLowPower -22",
        "ConfigureParameters 10 -22",
        "events arrived",
        "events shaped 1 ordered 1",
        "Enable closed -38",
        "PollOnce closed -22",
        "SetCallback closed -22",
        "EnableLowPower closed -38",
        "ConfigureParameters closed -38",
    };
    EXPECT_EQ(lines, expected);
    const std::optional<int> status = client->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 0);
}

TEST_F(Version1ClientTest, CallbackEnabledOnSampleGetsOnlyOnEvent) {
    auto client = Client("callback");
    std::optional<std::string> line = client->ReadLineStartingWith("handle ", kWait);
    ASSERT_TRUE(line);
    const int32_t handle = std::atoi(line->c_str() + 7);
    ASSERT_GT(handle, 0) << *line;
    ASSERT_EQ(line->substr(line->rfind(' ') + 1), "0") << "SetCallback";

    int32_t result = 1;
    ASSERT_TRUE(service_->EnableOnSample(handle, 50, 300, &result).isOk());
    EXPECT_EQ(result, -95) << "a version 1 callback cannot take a batch";
    EXPECT_TRUE(process_->WaitForLog(
        "EnableOnSample handle " + std::to_string(handle) + ": a version 1 callback", kWait));

    ASSERT_TRUE(service_->EnableOnSample(handle, 50, 0, &result).isOk());
    ASSERT_EQ(result, 0);
    for (int i = 0; i < 3; ++i) {
        ASSERT_TRUE(client->ReadLineStartingWith("event ", kWait)) << "event " << i;
    }
    ASSERT_TRUE(service_->Flush(handle, &result).isOk());
    EXPECT_EQ(result, -95) << "it has no OnFlushComplete";
    ASSERT_TRUE(service_->Disable(handle).isOk());

    client->CloseStdin();
    const std::optional<int> status = client->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 0);
}

}  // namespace
}  // namespace vyr_test::datapath
