// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <unistd.h>

#include "display_fixture.h"
#include "sensor_doubles.h"
#include "service_dump.h"
#include "thread_count.h"

namespace vyr_test::display {
namespace {

using sensor_doubles::CallsNamed;
using sensor_doubles::CountOf;
using sensor_doubles::kAlsReadSingleShot;
using sensor_doubles::WaitForCalls;

// Steps most tests share; call them through ASSERT_NO_FATAL_FAILURE so a failed wait ends the test.
class DisplayStateTest : public DisplayTest {
  protected:
    // Builds the service and waits until its monitor watches the panel.
    void WatchThePanel() {
        MakeService();
        ASSERT_TRUE(WaitForMonitorWatching(true));
    }
    // Shows a lit `state` on a dark panel and waits until the display has enabled the light mode.
    void LightThePanel(const std::string& state = "On") {
        Panel(state);
        ASSERT_TRUE(WaitForEnableLine(state + "\n"));
        ASSERT_TRUE(WaitForEnableCount(1));
    }
    // Shows "Off" on a lit panel and waits until nothing holds the light mode any more.
    void DarkenThePanel() {
        Panel("Off");
        ASSERT_TRUE(WaitForDisableLine("Off\n"));
        ASSERT_TRUE(WaitForEnableCount(0));
    }
};

TEST_F(DisplayStateTest, OnWithNewlineEnablesTheLightModeForTheDisplay) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    ASSERT_NO_FATAL_FAILURE(LightThePanel());
    const int32_t display = DisplayHandle();
    EXPECT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO, EnableWorkText(1, display, 1000, 1000), kWait));
    const auto block = vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock);
    EXPECT_TRUE(block.running);
    EXPECT_EQ(1, block.mode);
    EXPECT_EQ(1000, block.active_period);
    // The light mode samples with no client at all.
    ASSERT_TRUE(WaitForCalls(kAlsReadSingleShot, 1, kWait));
    const auto read = CallsNamed(kAlsReadSingleShot).front();
    EXPECT_EQ((std::vector<int64_t>{1, 30}), read.args);
    EXPECT_TRUE(read.als_enabled);

    ASSERT_NO_FATAL_FAILURE(DarkenThePanel());
    EXPECT_TRUE(log_.WaitFor(kTag, ANDROID_LOG_INFO, DisableWorkText(0, display, 1000), kWait));
    EXPECT_FALSE(vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock).running);
}

TEST_F(DisplayStateTest, DumpShowsTheLastPanelStateAndItsChanges) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    ASSERT_NO_FATAL_FAILURE(LightThePanel());
    std::string text = vyr_test::DumpOf(service_->asBinder().get()).text;
    EXPECT_NE(text.find("  monitor: watching " + std::string(kStatePath) + "\n"), std::string::npos)
        << text;
    EXPECT_NE(text.find("  last_state: On\n"), std::string::npos) << text;
    EXPECT_NE(text.find("event: display lit: On\n"), std::string::npos) << text;
    EXPECT_NE(text.find("    display: 1000\n"), std::string::npos) << "the display's period";

    Panel("Off");
    ASSERT_TRUE(WaitForDisableLine("Off\n"));
    text = vyr_test::DumpOf(service_->asBinder().get()).text;
    EXPECT_NE(text.find("  last_state: Off\n"), std::string::npos) << text;
    EXPECT_NE(text.find("event: display dark: Off\n"), std::string::npos) << text;
    EXPECT_TRUE(WaitForEnableCount(0));
}

TEST_F(DisplayStateTest, HbmIsLit) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    ASSERT_NO_FATAL_FAILURE(LightThePanel("HBM"));
    ASSERT_NO_FATAL_FAILURE(DarkenThePanel());
}

TEST_F(DisplayStateTest, OffLowerCaseOnAndEmptyAreDark) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    int32_t display = 0;
    // Each dark content is shown from a lit panel, so its disable line proves how it was judged.
    for (const std::string dark : {"Off", "on", ""}) {
        SCOPED_TRACE("content '" + dark + "'");
        const size_t enabled = EnableLines("On\n");
        Panel("On");
        ASSERT_TRUE(WaitForEnableLine("On\n", enabled + 1));
        if (display == 0) {
            ASSERT_TRUE(WaitForEnableCount(1));
            display = DisplayHandle();
        }
        Panel(dark);
        ASSERT_TRUE(WaitForDisableLine(dark + "\n"));
    }
    // The worker may lag behind the monitor: wait until it has applied every item.
    ASSERT_TRUE(WaitForWorkLog("DisableWork", display, 3));
    EXPECT_EQ(3u, WorkLogCount("EnableWork", display));
    EXPECT_EQ(3u, EnableLines("On\n"));
    const auto block = vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock);
    EXPECT_EQ(0, block.enable_count);
    EXPECT_FALSE(block.running);
}

TEST_F(DisplayStateTest, RepeatedLitNotificationsQueueOneEnable) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    ASSERT_NO_FATAL_FAILURE(LightThePanel());
    const int32_t display = DisplayHandle();
    // Contents of different lengths show, through the monitor's read position, that each
    // notification was read on its own.
    for (const std::string lit : {"HBM", "On On", "On"}) {
        Panel(lit);
        ASSERT_TRUE(WaitForMonitorRead(lit.size() + 1)) << lit;
    }
    Panel("Off");
    ASSERT_TRUE(WaitForDisableLine("Off\n"));
    ASSERT_TRUE(WaitForWorkLog("DisableWork", display, 1));
    EXPECT_EQ(1u, EnableLines("On\n"));
    EXPECT_EQ(0u, EnableLines("HBM\n"));
    EXPECT_EQ(0u, EnableLines("On On\n"));
    EXPECT_EQ(1u, WorkLogCount("EnableWork", display));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO, DisableWorkText(0, display, 1000)));
    EXPECT_EQ(0, vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock).enable_count);
}

TEST_F(DisplayStateTest, RepeatedDarkNotificationsQueueNothing) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    for (const std::string dark : {"Off", "Offline", "off"}) {
        Panel(dark);
        ASSERT_TRUE(WaitForMonitorRead(dark.size() + 1)) << dark;
    }
    // The first transition afterwards is logged as the first one of any kind.
    ASSERT_NO_FATAL_FAILURE(LightThePanel());
    const int32_t display = DisplayHandle();
    EXPECT_EQ(0u, WorkLogCount("DisableWork", display));
    EXPECT_EQ(0u, DisableLines("Off\n") + DisableLines("Offline\n") + DisableLines("off\n"));
    ASSERT_NO_FATAL_FAILURE(DarkenThePanel());
}

TEST_F(DisplayStateTest, OnlyTheFirstFortyNineBytesAreJudged) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    ASSERT_NO_FATAL_FAILURE(LightThePanel());
    const int32_t display = DisplayHandle();
    // 49 bytes, then "On": 52 bytes with the newline; "On" lies beyond the judged text.
    Panel(std::string(49, 'x') + "On");
    ASSERT_TRUE(WaitForDisableLine(std::string(49, 'x')));
    // "On" at bytes 47 and 48: exactly 50 bytes read, the last (the newline) dropped.
    Panel(std::string(47, 'x') + "On");
    ASSERT_TRUE(WaitForEnableLine(std::string(47, 'x') + "On"));
    // "On" at bytes 48 and 49: the 'n' is the byte that a 50-byte read loses.
    Panel(std::string(48, 'x') + "On");
    ASSERT_TRUE(WaitForDisableLine(std::string(48, 'x') + "O"));
    // The longest hostname, 64 bytes, with "HBM" at its start.
    Panel("HBM" + std::string(61, 'y'));
    ASSERT_TRUE(WaitForEnableLine("HBM" + std::string(46, 'y')));
    Panel("Off");
    ASSERT_TRUE(WaitForDisableLine("Off\n"));
    ASSERT_TRUE(WaitForWorkLog("DisableWork", display, 3));
    EXPECT_EQ(0, vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock).enable_count);
}

TEST_F(DisplayStateTest, DisplayAndClientShareTheLightMode) {
    ASSERT_NO_FATAL_FAILURE(WatchThePanel());
    ASSERT_NO_FATAL_FAILURE(LightThePanel());
    const int32_t display = DisplayHandle();

    int32_t client = 0;
    ASSERT_TRUE(service_->Open(1, &client).isOk());
    ASSERT_GT(client, 0);
    EXPECT_NE(display, client);
    int32_t result = 1;
    ASSERT_TRUE(service_->Enable(client, 200, &result).isOk());
    ASSERT_EQ(0, result);
    ASSERT_TRUE(WaitForWorkLog("EnableWork", client, 1));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO, EnableWorkText(2, client, 200, 200)));
    auto block = vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock);
    EXPECT_EQ(2, block.enable_count);
    EXPECT_EQ(200, block.active_period);
    EXPECT_EQ((std::unordered_map<int32_t, int32_t>{{display, 1000}, {client, 200}}), block.periods);

    ASSERT_TRUE(service_->Disable(client).isOk());
    ASSERT_TRUE(WaitForWorkLog("DisableWork", client, 1));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO, DisableWorkText(1, client, 1000)));
    block = vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock);
    EXPECT_EQ(1, block.enable_count);
    EXPECT_EQ(1000, block.active_period);
    EXPECT_TRUE(block.running);
    const size_t reads = CountOf(kAlsReadSingleShot);
    EXPECT_TRUE(WaitForCalls(kAlsReadSingleShot, reads + 1, kWait)) << "sampling goes on";

    Panel("Off");
    ASSERT_TRUE(WaitForDisableLine("Off\n"));
    ASSERT_TRUE(WaitForWorkLog("DisableWork", display, 1));
    EXPECT_TRUE(log_.Contains(kTag, ANDROID_LOG_INFO, DisableWorkText(0, display, 1000)));
    block = vyr_test::ServicePeer::SnapshotModeBlock(*service_, kAlsBlock);
    EXPECT_EQ(0, block.enable_count);
    EXPECT_FALSE(block.running);
    // The worker joined the processing thread before it logged: no read starts any more, which a
    // wait of more than one sampling period confirms.
    const size_t final_reads = CountOf(kAlsReadSingleShot);
    EXPECT_FALSE(WaitForCalls(kAlsReadSingleShot, final_reads + 1, 1500ms));
    ASSERT_TRUE(service_->Close(client).isOk());
}

TEST_F(DisplayStateTest, NoMonitorWithoutTheLightProperty) {
    MakeService(false, true);
    // The constructor started the range worker only.
    EXPECT_EQ(baseline_threads_ + 1, ThreadCount());
    EXPECT_FALSE(MonitorWatching());
    Panel("On");
    int32_t handle = 0;
    ASSERT_TRUE(service_->Open(1, &handle).isOk());
    EXPECT_EQ(-19, handle);
    EXPECT_EQ(0u, EnableLines("On\n"));
}

}  // namespace
}  // namespace vyr_test::display
