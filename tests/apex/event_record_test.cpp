// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <apex_update_listener.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <log_capture.h>
#include <sys/inotify.h>

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "apex_info_xml.h"
#include "apex_update_listener_test_peer.h"
#include "callback_recorder.h"
#include "event_feed.h"
#include "file_read_observer.h"
#include "temp_info_list.h"

namespace vyr_test::apex {
namespace {

using Info = ApexUpdateListener::Info;
using namespace std::chrono_literals;

constexpr auto kDeadline = 10s;

// The listener's thread reads event records that the test sends, while the list file is left
// alone between events: each record's handling is then seen on its own.
class EventRecordTest : public ::testing::Test {
  protected:
    void SetUp() override {
        ASSERT_TRUE(list_.Write(InfoList({Entry(ActiveEntry(kPackage, 1))})));
        observer_ = std::make_unique<FileReadObserver>(list_.path());
        listener_ = ApexUpdateListenerTestPeer::MakeWithEventSource(
            kPackage, list_.path(), recorder_.AsCallback(), feed_.TakeListenerEnd(),
            {ActiveInfo(kPackage, 1)});
    }

    void TearDown() override {
        // With no watch to remove, the end of the feed is what lets the thread see the stop.
        feed_.Close();
        listener_.reset();
    }

    std::string Line(const char* event, const char* kind) const {
        return list_.path() + " " + event + " as " + kind;
    }

    // Sends a record that is logged and never re-read, after the records under test; once its
    // line is logged, every earlier record has been handled completely.
    void SendBarrierAndWait(size_t expected_barriers = 1) {
        ASSERT_TRUE(feed_.SendRecords({IN_CREATE | IN_DELETE | IN_ISDIR}));
        ASSERT_TRUE(log_.WaitFor(kLogTag, ANDROID_LOG_INFO, Line("created", "directory"), kDeadline,
                                 expected_barriers));
    }

    // A change that any re-read would report.
    void ChangeList(int64_t version) {
        ASSERT_TRUE(list_.Write(InfoList({Entry(ActiveEntry(kPackage, version))})));
    }

    // The lines of the listener's tag, in order.
    std::vector<std::string> ListenerLines() const {
        std::vector<std::string> lines;
        for (const auto& record : log_.Records()) {
            if (record.tag == kLogTag) lines.push_back(record.message);
        }
        return lines;
    }

    void ExpectOneCallbackTo(int64_t version) {
        ASSERT_TRUE(recorder_.WaitForCalls(1, kDeadline));
        auto calls = recorder_.Calls();
        ASSERT_EQ(calls.size(), 1u);
        EXPECT_EQ(Fields(calls[0].old_info), Fields(std::set<Info>{ActiveInfo(kPackage, 1)}));
        EXPECT_EQ(Fields(calls[0].new_info), Fields(std::set<Info>{ActiveInfo(kPackage, version)}));
    }

    // After a change to version 2 and records that must not re-read the list: had any of them
    // re-read it, version 2 would have been reported already, before this change to version 3.
    void ExpectNoReReadSoFar() {
        ChangeList(3);
        ASSERT_TRUE(feed_.SendRecords({IN_MODIFY}));
        ExpectOneCallbackTo(3);
    }

    vyr_test::LogCapture log_;
    TempInfoList list_;
    EventFeed feed_;
    CallbackRecorder recorder_;
    std::unique_ptr<FileReadObserver> observer_;
    std::unique_ptr<ApexUpdateListener> listener_;
};

TEST_F(EventRecordTest, ModifyIsLoggedAndReRead) {
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_MODIFY}));
    ExpectOneCallbackTo(2);
    EXPECT_EQ(ListenerLines(), std::vector<std::string>{Line("modified", "file")});
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Line("modified", "file")), 1u);
}

TEST_F(EventRecordTest, CreateIsLoggedAndReRead) {
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_CREATE}));
    ExpectOneCallbackTo(2);
    EXPECT_EQ(ListenerLines(), std::vector<std::string>{Line("created", "file")});
}

TEST_F(EventRecordTest, DirectoryFlagNamesTheKind) {
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_MODIFY | IN_ISDIR}));
    ExpectOneCallbackTo(2);
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Line("modified", "directory")), 1u);
}

TEST_F(EventRecordTest, CreateWithDeleteLogsCreatedOnlyAndDoesNotReRead) {
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_CREATE | IN_DELETE}));
    SendBarrierAndWait();
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Line("created", "file")), 1u);
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Line("deleted", "file")), 0u);
    ExpectNoReReadSoFar();
}

TEST_F(EventRecordTest, DeleteAloneLogsDeletedAndDoesNotReRead) {
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_DELETE}));
    SendBarrierAndWait();
    EXPECT_EQ(ListenerLines(),
              (std::vector<std::string>{Line("deleted", "file"), Line("created", "directory")}));
    ExpectNoReReadSoFar();
}

TEST_F(EventRecordTest, DeleteModifyIsLoggedAsDeletedAndNotReRead) {
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_DELETE | IN_MODIFY}));
    SendBarrierAndWait();
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Line("modified", "file")), 0u);
    ExpectNoReReadSoFar();
}

TEST_F(EventRecordTest, OtherEventsReReadWithoutALine) {
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_IGNORED}));
    ExpectOneCallbackTo(2);
    ChangeList(3);
    ASSERT_TRUE(feed_.SendRecords({IN_Q_OVERFLOW}));
    ASSERT_TRUE(recorder_.WaitForCalls(2, kDeadline));
    EXPECT_TRUE(ListenerLines().empty());
}

TEST_F(EventRecordTest, EveryRecordOfOneReadIsReReadButAChangeIsReportedOnce) {
    ChangeList(2);
    observer_->Drain();
    ASSERT_TRUE(feed_.SendRecords({IN_MODIFY, IN_MODIFY, IN_MODIFY}));
    ASSERT_TRUE(log_.WaitFor(kLogTag, ANDROID_LOG_INFO, Line("modified", "file"), kDeadline, 3));
    for (int read = 0; read < 3; ++read) {
        ASSERT_TRUE(observer_->WaitForRead(kDeadline)) << "re-read " << read;
    }
    SendBarrierAndWait();
    ExpectOneCallbackTo(2);
}

TEST_F(EventRecordTest, SixteenRecordsFitInOneRead) {
    std::vector<uint32_t> masks(15, IN_CREATE | IN_DELETE);
    masks.push_back(IN_CREATE | IN_DELETE | IN_ISDIR);
    ASSERT_TRUE(feed_.SendRecords(masks));
    ASSERT_TRUE(log_.WaitFor(kLogTag, ANDROID_LOG_INFO, Line("created", "directory"), kDeadline));
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Line("created", "file")), 15u);
}

TEST_F(EventRecordTest, TrailingBytesBeyondWholeRecordsAreIgnored) {
    // Eight trailing bytes that would read as a delete event if taken for a record.
    std::string partial = EventFeed::Record(IN_DELETE).substr(0, 8);
    ASSERT_TRUE(feed_.Send(EventFeed::Record(IN_CREATE | IN_DELETE) + partial));
    SendBarrierAndWait();
    EXPECT_EQ(ListenerLines(),
              (std::vector<std::string>{Line("created", "file"), Line("created", "directory")}));
}

TEST_F(EventRecordTest, ShortReadIsIgnored) {
    ChangeList(2);
    ASSERT_TRUE(feed_.Send(EventFeed::Record(IN_MODIFY).substr(0, 15)));
    SendBarrierAndWait();
    EXPECT_EQ(ListenerLines(), std::vector<std::string>{Line("created", "directory")});
    ExpectNoReReadSoFar();
}

TEST_F(EventRecordTest, FailedReReadKeepsTheRecords) {
    ASSERT_TRUE(list_.Write("<apex-info-list>"));
    ASSERT_TRUE(feed_.SendRecords({IN_MODIFY}));
    ASSERT_TRUE(log_.WaitUntil(
        [](const std::vector<vyr_test::LogRecord>& records) {
            for (const auto& record : records) {
                if (record.tag == kLogTag && record.priority == ANDROID_LOG_ERROR &&
                    record.message.rfind("XML parsing failed: ", 0) == 0) {
                    return true;
                }
            }
            return false;
        },
        kDeadline));
    ChangeList(1);
    ASSERT_TRUE(feed_.SendRecords({IN_MODIFY}));
    ChangeList(2);
    ASSERT_TRUE(feed_.SendRecords({IN_MODIFY}));
    ExpectOneCallbackTo(2);
}

// The thread ends on a failed read and says why; destruction then only joins it.
TEST(EventReadFailureTest, FailedReadIsLoggedAndEndsTheThread) {
    vyr_test::LogCapture log;
    TempInfoList list;
    ASSERT_TRUE(list.Write(InfoList({Entry(ActiveEntry(kPackage, 1))})));
    CallbackRecorder recorder;
    // Reading a write-only descriptor fails with EBADF.
    int write_only = open("/dev/null", O_WRONLY | O_CLOEXEC);
    ASSERT_GE(write_only, 0);
    auto listener = ApexUpdateListenerTestPeer::MakeWithEventSource(
        kPackage, list.path(), recorder.AsCallback(), write_only, {ActiveInfo(kPackage, 1)});
    std::string expected = "Error reading inotify event from '" + list.path() +
                           "': " + strerror(EBADF) + " (" + std::to_string(EBADF) + ")";
    EXPECT_TRUE(log.WaitFor(kLogTag, ANDROID_LOG_ERROR, expected, kDeadline));
    listener.reset();
    EXPECT_EQ(log.Count(kLogTag, ANDROID_LOG_ERROR, expected), 1u);
    EXPECT_TRUE(recorder.Calls().empty());
}

}  // namespace
}  // namespace vyr_test::apex
