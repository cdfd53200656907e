// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <apex_update_listener.h>
#include <gtest/gtest.h>
#include <log_capture.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <string>
#include <vector>

#include "apex_info_xml.h"
#include "callback_recorder.h"
#include "inotify_descriptors.h"
#include "temp_info_list.h"

namespace vyr_test::apex {
namespace {

using Info = ApexUpdateListener::Info;
using namespace std::chrono_literals;

constexpr auto kDeadline = 10s;

class MakeTest : public ::testing::Test {
  protected:
    void SetUp() override {
        ASSERT_TRUE(list_.Write(InfoList({Entry(ActiveEntry(kPackage, 1))})));
        inotify_before_ = InotifyDescriptors();
    }

    // The inotify instances opened since SetUp.
    std::vector<int> NewInotifyDescriptors() const {
        std::vector<int> added;
        for (int fd : InotifyDescriptors()) {
            if (inotify_before_.count(fd) == 0) added.push_back(fd);
        }
        return added;
    }

    // The listener's records, in order.
    std::vector<vyr_test::LogRecord> ListenerRecords() const {
        std::vector<vyr_test::LogRecord> records;
        for (const auto& record : log_.Records()) {
            if (record.tag == kLogTag) records.push_back(record);
        }
        return records;
    }

    // Make leaves its inotify instance open on these failures. Expect exactly that one and
    // close it, so the test process itself leaks nothing.
    void ExpectAndCloseLeftOpenInstance() {
        std::vector<int> added = NewInotifyDescriptors();
        ASSERT_EQ(added.size(), 1u);
        close(added[0]);
    }

    vyr_test::LogCapture log_;
    TempInfoList list_;
    std::set<int> inotify_before_;
    CallbackRecorder recorder_;
};

TEST_F(MakeTest, MissingPathFailsAtTheWatch) {
    std::string missing = list_.directory() + "/missing.xml";
    EXPECT_EQ(ApexUpdateListener::Make(kPackage, recorder_.AsCallback(), false, missing), nullptr);
    auto records = ListenerRecords();
    ASSERT_EQ(records.size(), 1u);
    EXPECT_EQ(records[0].priority, ANDROID_LOG_ERROR);
    EXPECT_EQ(records[0].message, "Failed to inotify_add_watch(" + missing +
                                      "): No such file or directory (" + std::to_string(ENOENT) +
                                      ")");
    EXPECT_TRUE(NewInotifyDescriptors().empty()) << "the instance must be closed";
    EXPECT_TRUE(recorder_.Calls().empty());
}

TEST_F(MakeTest, FailingInotifyInitIsLogged) {
    rlimit saved;
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &saved), 0);
    // With the limit at the lowest free descriptor, the next descriptor cannot be opened.
    int lowest_free = dup(STDERR_FILENO);
    ASSERT_GE(lowest_free, 0);
    close(lowest_free);
    rlimit tight = saved;
    tight.rlim_cur = static_cast<rlim_t>(lowest_free);
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &tight), 0);
    auto listener = ApexUpdateListener::Make(kPackage, recorder_.AsCallback(), false, list_.path());
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &saved), 0);

    EXPECT_EQ(listener, nullptr);
    auto records = ListenerRecords();
    ASSERT_EQ(records.size(), 1u);
    EXPECT_EQ(records[0].priority, ANDROID_LOG_ERROR);
    EXPECT_EQ(records[0].message, std::string("Failed to inotify_init(): ") + strerror(EMFILE) +
                                      " (" + std::to_string(EMFILE) + ")");
}

TEST_F(MakeTest, EmptyCallbackFailsAfterTheWatch) {
    EXPECT_EQ(ApexUpdateListener::Make(kPackage, nullptr, false, list_.path()), nullptr);
    auto records = ListenerRecords();
    ASSERT_EQ(records.size(), 1u);
    EXPECT_EQ(records[0].priority, ANDROID_LOG_ERROR);
    EXPECT_EQ(records[0].message, "Called with null callback");
    ExpectAndCloseLeftOpenInstance();
}

TEST_F(MakeTest, EmptyCallbackFailsEvenWithInitialVersion) {
    EXPECT_EQ(ApexUpdateListener::Make(kPackage, {}, true, list_.path()), nullptr);
    EXPECT_TRUE(log_.Contains(kLogTag, ANDROID_LOG_ERROR, "Called with null callback"));
    ExpectAndCloseLeftOpenInstance();
}

TEST_F(MakeTest, UnreadableListFailsAfterTheReadersMessage) {
    ASSERT_TRUE(list_.Write(InfoList({Entry(ActiveEntry(kOtherPackage, 1))})));
    EXPECT_EQ(ApexUpdateListener::Make(kPackage, recorder_.AsCallback(), true, list_.path()),
              nullptr);
    auto records = ListenerRecords();
    ASSERT_EQ(records.size(), 2u);
    EXPECT_EQ(records[0].priority, ANDROID_LOG_ERROR);
    EXPECT_EQ(records[0].message,
              "XML did not contain any apex-info about com.tarven.nomil.camera.hal");
    EXPECT_EQ(records[1].priority, ANDROID_LOG_ERROR);
    EXPECT_EQ(records[1].message, "Could not slurp info from " + list_.path() +
                                      " for package com.tarven.nomil.camera.hal");
    EXPECT_TRUE(recorder_.Calls().empty());
    ExpectAndCloseLeftOpenInstance();
}

TEST_F(MakeTest, WithoutInitialVersionNoCallbackBeforeAChange) {
    auto listener = ApexUpdateListener::Make(kPackage, recorder_.AsCallback(), false, list_.path());
    ASSERT_NE(listener, nullptr);
    EXPECT_TRUE(ListenerRecords().empty());
    ASSERT_TRUE(list_.Write(InfoList({Entry(ActiveEntry(kPackage, 2))})));
    ASSERT_TRUE(recorder_.WaitForCalls(1, kDeadline));
    auto calls = recorder_.Calls();
    ASSERT_EQ(calls.size(), 1u);
    EXPECT_EQ(Fields(calls[0].old_info), Fields(std::set<Info>{ActiveInfo(kPackage, 1)}));
    listener.reset();
    EXPECT_TRUE(NewInotifyDescriptors().empty());
}

TEST_F(MakeTest, InitialVersionIsReportedBeforeMakeReturns) {
    auto listener = ApexUpdateListener::Make(kPackage, recorder_.AsCallback(), true, list_.path());
    ASSERT_NE(listener, nullptr);
    // No wait: the call has already happened, on this thread.
    auto calls = recorder_.Calls();
    ASSERT_EQ(calls.size(), 1u);
    EXPECT_TRUE(calls[0].old_info.empty());
    EXPECT_EQ(Fields(calls[0].new_info), Fields(std::set<Info>{ActiveInfo(kPackage, 1)}));
    EXPECT_EQ(calls[0].thread, std::this_thread::get_id());

    // The listener then runs from the initial records.
    ASSERT_TRUE(list_.Write(InfoList({Entry(ActiveEntry(kPackage, 2))})));
    ASSERT_TRUE(recorder_.WaitForCalls(2, kDeadline));
    calls = recorder_.Calls();
    ASSERT_EQ(calls.size(), 2u);
    EXPECT_EQ(Fields(calls[1].old_info), Fields(std::set<Info>{ActiveInfo(kPackage, 1)}));
    EXPECT_EQ(Fields(calls[1].new_info), Fields(std::set<Info>{ActiveInfo(kPackage, 2)}));
    EXPECT_NE(calls[1].thread, std::this_thread::get_id());
    listener.reset();
    EXPECT_TRUE(NewInotifyDescriptors().empty());
}

}  // namespace
}  // namespace vyr_test::apex
