// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>

#include <cerrno>
#include <string>

#include "display_fixture.h"

namespace vyr_test::display {
namespace {

constexpr char kReadError[] = "vyrservice failed to read display state file: ";

class AttributeContentTest : public DisplayTest {
  protected:
    // Sets a lit `content` on the dark attribute and waits until the display has enabled the
    // light mode; call it through ASSERT_NO_FATAL_FAILURE.
    void LightTheAttribute(const std::string& content) {
        fuse_->Set(content);
        ASSERT_TRUE(WaitForEnableLine(content));
        ASSERT_TRUE(WaitForEnableCount(1));
    }
};

TEST_F(AttributeContentTest, ReadErrorWhileDarkLogsAndQueuesNothing) {
    MakeServiceOnFuse();
    if (fuse_ == nullptr) return;
    ASSERT_TRUE(fuse_->WaitForOpens(1, kWait));
    fuse_->FailReads(EIO);
    fuse_->Notify();
    ASSERT_TRUE(
        log_.WaitFor(kTag, ANDROID_LOG_ERROR, std::string(kReadError) + strerror(EIO), kWait));
    fuse_->FailReads(ENODEV);
    fuse_->Notify();
    ASSERT_TRUE(
        log_.WaitFor(kTag, ANDROID_LOG_ERROR, std::string(kReadError) + strerror(ENODEV), kWait));

    // Had either error queued a disable, this first enable would not count 1.
    fuse_->FailReads(0);
    ASSERT_NO_FATAL_FAILURE(LightTheAttribute("On\n"));
    const int32_t display = DisplayHandle();
    EXPECT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO, EnableWorkText(1, display, 1000, 1000), kWait));
    EXPECT_EQ(0u, WorkLogCount("DisableWork", display));
    EXPECT_EQ(0u, DisableLines("On\n"));
}

TEST_F(AttributeContentTest, ReadErrorWhileLitDisablesAsDark) {
    MakeServiceOnFuse();
    if (fuse_ == nullptr) return;
    ASSERT_TRUE(fuse_->WaitForOpens(1, kWait));
    ASSERT_NO_FATAL_FAILURE(LightTheAttribute("On\n"));
    const int32_t display = DisplayHandle();

    fuse_->FailReads(EIO);
    fuse_->Notify();
    ASSERT_TRUE(
        log_.WaitFor(kTag, ANDROID_LOG_ERROR, std::string(kReadError) + strerror(EIO), kWait));
    ASSERT_TRUE(WaitForWorkLog("DisableWork", display, 1));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO, DisableWorkText(0, display, 1000)));
    EXPECT_FALSE(vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock).running);
    // The error path logs no display-state line of its own.
    EXPECT_EQ(0u, DisableLines("On\n"));

    // A second error while now dark queues nothing more; lit again is a new transition.
    const size_t reads = fuse_->reads();
    fuse_->Notify();
    ASSERT_TRUE(fuse_->WaitForReads(reads + 1, kWait));
    fuse_->FailReads(0);
    fuse_->Set("On\n");
    ASSERT_TRUE(WaitForEnableLine("On\n", 2));
    ASSERT_TRUE(WaitForWorkLog("EnableWork", display, 2));
    EXPECT_EQ(1u, WorkLogCount("DisableWork", display));
    EXPECT_TRUE(WaitForEnableCount(1));
}

TEST_F(AttributeContentTest, ContentIsJudgedAsReadWithoutANewline) {
    MakeServiceOnFuse();
    if (fuse_ == nullptr) return;
    ASSERT_TRUE(fuse_->WaitForOpens(1, kWait));
    ASSERT_NO_FATAL_FAILURE(LightTheAttribute("On"));
    const int32_t display = DisplayHandle();
    // Truly empty content (zero bytes read) is dark.
    fuse_->Set("");
    ASSERT_TRUE(WaitForDisableLine(""));
    fuse_->Set("xHBMx");
    ASSERT_TRUE(WaitForEnableLine("xHBMx"));
    // Exactly 50 bytes: "On" in bytes 48 and 49, of which the read keeps only the 'O'.
    fuse_->Set(std::string(48, ' ') + "On");
    ASSERT_TRUE(WaitForDisableLine(std::string(48, ' ') + "O"));
    // Far more than 50 bytes, lit within the first 49.
    fuse_->Set(std::string(47, '-') + "On" + std::string(200, '-'));
    ASSERT_TRUE(WaitForEnableLine(std::string(47, '-') + "On"));
    fuse_->Set("hbm on ON");
    ASSERT_TRUE(WaitForDisableLine("hbm on ON"));
    // The worker may lag behind the monitor: wait until it has applied every item.
    ASSERT_TRUE(WaitForWorkLog("DisableWork", display, 3));
    EXPECT_EQ(0, vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock).enable_count);
}

}  // namespace
}  // namespace vyr_test::display
