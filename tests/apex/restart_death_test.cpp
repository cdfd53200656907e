// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <apex_update_listener.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <string>
#include <thread>

#include "apex_info_xml.h"
#include "temp_info_list.h"

namespace vyr_test::apex {
namespace {

using namespace std::chrono_literals;

// Runs in the child: the process's restart callback, then a change of the package's entry.
void RunUntilRestart(TempInfoList& list) {
    auto listener = ApexUpdateListener::Make(
        kPackage,
        [](const auto&, const auto&) {
            __android_log_print(ANDROID_LOG_INFO, "vyrservice_main",
                                "APEX version updated. Restarting.");
            exit(0);
        },
        false, list.path());
    if (listener == nullptr) _exit(2);
    if (!list.Write(InfoList({Entry(ActiveEntry(kPackage, 2))}))) _exit(4);
    // The exit happens on the listener thread; this only bounds the wait for it.
    std::this_thread::sleep_for(30s);
    _exit(3);
}

TEST(ApexRestartDeathTest, ChangeOfThePackageExitsWithStatusZero) {
    // The default style forks right here, so the child shares this list and its clean-up.
    TempInfoList list;
    ASSERT_TRUE(list.Write(InfoList({Entry(ActiveEntry(kPackage, 1))})));
    EXPECT_EXIT(RunUntilRestart(list), ::testing::ExitedWithCode(0),
                "vyrservice_main.*APEX version updated\\. Restarting\\.");
}

}  // namespace
}  // namespace vyr_test::apex
