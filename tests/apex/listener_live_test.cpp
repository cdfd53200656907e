// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <apex_update_listener.h>
#include <gtest/gtest.h>
#include <log_capture.h>
#include <sys/stat.h>
#include <tinyxml2.h>

#include <chrono>
#include <future>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "apex_info_xml.h"
#include "callback_recorder.h"
#include "file_read_observer.h"
#include "inotify_descriptors.h"
#include "temp_info_list.h"

namespace vyr_test::apex {
namespace {

using Info = ApexUpdateListener::Info;
using namespace std::chrono_literals;

constexpr auto kDeadline = 10s;

// A listener watching a real file through inotify. Every write is one modification, and each
// step waits until the listener has read the file again, so no change can be skipped.
class ListenerLiveTest : public ::testing::Test {
  protected:
    void SetUp() override {
        initial_ = InfoList({Entry(ActiveEntry(kOtherPackage, 1)), Entry(ActiveEntry(kPackage, 1))});
        ASSERT_TRUE(list_.Write(initial_));
        inotify_before_ = InotifyDescriptors();
        listener_ = ApexUpdateListener::Make(kPackage, recorder_.AsCallback(), false, list_.path());
        ASSERT_NE(listener_, nullptr);
        observer_ = std::make_unique<FileReadObserver>(list_.path());
    }

    void TearDown() override {
        listener_.reset();
        observer_.reset();
        EXPECT_EQ(InotifyDescriptors(), inotify_before_);
    }

    // Writes the list and waits until the listener has read it.
    void WriteAndAwaitRead(const std::string& content) {
        ASSERT_TRUE(list_.Write(content));
        ASSERT_TRUE(observer_->WaitForRead(kDeadline)) << "the listener did not read the list";
    }

    // Changes the package's entry and expects that change to be the only callback so far.
    void ExpectOnlyCallbackIsSentinel(const std::set<Info>& old_info) {
        ASSERT_TRUE(list_.Write(InfoList({Entry(ActiveEntry(kPackage, 99))})));
        ASSERT_TRUE(recorder_.WaitForCalls(1, kDeadline));
        auto calls = recorder_.Calls();
        ASSERT_EQ(calls.size(), 1u);
        EXPECT_EQ(Fields(calls[0].old_info), Fields(old_info));
        EXPECT_EQ(Fields(calls[0].new_info), Fields(std::set<Info>{ActiveInfo(kPackage, 99)}));
    }

    size_t ListenerErrors() const {
        size_t count = 0;
        for (const auto& record : log_.Records()) {
            if (record.tag == kLogTag && record.priority == ANDROID_LOG_ERROR) ++count;
        }
        return count;
    }

    std::string Modified() const { return list_.path() + " modified as file"; }

    vyr_test::LogCapture log_;
    TempInfoList list_;
    std::string initial_;
    std::set<int> inotify_before_;
    CallbackRecorder recorder_;
    std::unique_ptr<FileReadObserver> observer_;
    // Declared last: its thread calls into the members above until it is destroyed.
    std::unique_ptr<ApexUpdateListener> listener_;
};

TEST_F(ListenerLiveTest, ChangeOfOtherPackageGivesNoCallback) {
    WriteAndAwaitRead(
        InfoList({Entry(ActiveEntry(kOtherPackage, 2)), Entry(ActiveEntry(kPackage, 1))}));
    EXPECT_TRUE(log_.Contains(kLogTag, ANDROID_LOG_INFO, Modified()));
    ExpectOnlyCallbackIsSentinel({ActiveInfo(kPackage, 1)});
    EXPECT_EQ(ListenerErrors(), 0u);
}

TEST_F(ListenerLiveTest, WhiteSpaceChangeGivesNoCallback) {
    std::string spaced = initial_;
    for (size_t at = spaced.find("<apex-info "); at != std::string::npos;
         at = spaced.find("<apex-info ", at + 1)) {
        spaced.replace(at, 11, "<apex-info \n\t  ");
    }
    WriteAndAwaitRead("\n  " + spaced + "\n\n");
    ExpectOnlyCallbackIsSentinel({ActiveInfo(kPackage, 1)});
    EXPECT_EQ(ListenerErrors(), 0u);
}

TEST_F(ListenerLiveTest, ReorderedEntriesGiveNoCallback) {
    WriteAndAwaitRead(
        InfoList({Entry(ActiveEntry(kPackage, 1)), Entry(ActiveEntry(kOtherPackage, 1))}));
    ExpectOnlyCallbackIsSentinel({ActiveInfo(kPackage, 1)});
}

struct FieldChange {
    const char* attribute;
    const char* value;
    void (*apply)(Info&);
};

void PrintTo(const FieldChange& c, std::ostream* os) {
    *os << c.attribute << "=\"" << c.value << '"';
}

class ListenerFieldChangeTest : public ListenerLiveTest,
                                public ::testing::WithParamInterface<FieldChange> {};

TEST_P(ListenerFieldChangeTest, OneChangedFieldGivesOneCallback) {
    Attributes changed = ActiveEntry(kPackage, 1);
    for (auto& [name, value] : changed) {
        if (name == GetParam().attribute) value = GetParam().value;
    }
    Info expected = ActiveInfo(kPackage, 1);
    GetParam().apply(expected);

    WriteAndAwaitRead(InfoList({Entry(ActiveEntry(kOtherPackage, 1)), Entry(changed)}));
    ASSERT_TRUE(recorder_.WaitForCalls(1, kDeadline));
    auto calls = recorder_.Calls();
    ASSERT_EQ(calls.size(), 1u);
    EXPECT_EQ(Fields(calls[0].old_info), Fields(std::set<Info>{ActiveInfo(kPackage, 1)}));
    EXPECT_EQ(Fields(calls[0].new_info), Fields(std::set<Info>{expected}));
    EXPECT_NE(calls[0].thread, std::this_thread::get_id());
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Modified()), 1u);
    EXPECT_EQ(ListenerErrors(), 0u);
}

INSTANTIATE_TEST_SUITE_P(
    OneField, ListenerFieldChangeTest,
    ::testing::Values(
        FieldChange{"isActive", "false", [](Info& i) { i.is_active = false; }},
        FieldChange{"versionCode", "2", [](Info& i) { i.version_code = 2; }},
        FieldChange{"modulePath", "/data/apex/active/camera.apex",
                    [](Info& i) { i.module_path = "/data/apex/active/camera.apex"; }},
        FieldChange{"preinstalledModulePath", "/system/apex/camera.apex",
                    [](Info& i) { i.preinstalled_module_path = "/system/apex/camera.apex"; }},
        FieldChange{"versionName", "v1-hotfix", [](Info& i) { i.version_name = "v1-hotfix"; }},
        FieldChange{"isFactory", "true", [](Info& i) { i.is_factory = true; }}),
    [](const auto& info) { return std::string(info.param.attribute); });

TEST_F(ListenerLiveTest, AddedRecordGivesOneCallback) {
    Attributes factory = ActiveEntry(kPackage, 1);
    factory.back().second = "false";
    factory[5].second = "true";
    WriteAndAwaitRead(InfoList({Entry(ActiveEntry(kPackage, 2)), Entry(factory)}));
    ASSERT_TRUE(recorder_.WaitForCalls(1, kDeadline));
    Info factory_info = ActiveInfo(kPackage, 1);
    factory_info.is_active = false;
    factory_info.is_factory = true;
    auto calls = recorder_.Calls();
    ASSERT_EQ(calls.size(), 1u);
    EXPECT_EQ(Fields(calls[0].new_info),
              Fields(std::set<Info>{factory_info, ActiveInfo(kPackage, 2)}));
}

TEST_F(ListenerLiveTest, EachCallbackStartsFromThePreviousChange) {
    WriteAndAwaitRead(InfoList({Entry(ActiveEntry(kPackage, 2))}));
    ASSERT_TRUE(recorder_.WaitForCalls(1, kDeadline));
    WriteAndAwaitRead(InfoList({Entry(ActiveEntry(kPackage, 3))}));
    ASSERT_TRUE(recorder_.WaitForCalls(2, kDeadline));
    auto calls = recorder_.Calls();
    ASSERT_EQ(calls.size(), 2u);
    EXPECT_EQ(Fields(calls[1].old_info), Fields(std::set<Info>{ActiveInfo(kPackage, 2)}));
    EXPECT_EQ(Fields(calls[1].new_info), Fields(std::set<Info>{ActiveInfo(kPackage, 3)}));
}

TEST_F(ListenerLiveTest, EntryVanishingAndReturningUnchangedGivesNoCallback) {
    WriteAndAwaitRead(InfoList({Entry(ActiveEntry(kOtherPackage, 1))}));
    EXPECT_TRUE(log_.WaitFor(kLogTag, ANDROID_LOG_ERROR,
                             "XML did not contain any apex-info about com.tarven.nomil.camera.hal",
                             kDeadline));
    WriteAndAwaitRead(initial_);
    ExpectOnlyCallbackIsSentinel({ActiveInfo(kPackage, 1)});
    EXPECT_EQ(ListenerErrors(), 1u);
}

TEST_F(ListenerLiveTest, UnparsableFileIsLoggedAndNextWriteIsPickedUp) {
    std::string half = initial_.substr(0, initial_.size() / 2);
    WriteAndAwaitRead(half);
    // The file as the listener saw it: the half list padded with new lines.
    tinyxml2::XMLDocument document;
    int error = document.LoadFile(list_.path().c_str());
    ASSERT_NE(error, tinyxml2::XML_SUCCESS);
    EXPECT_TRUE(log_.WaitFor(kLogTag, ANDROID_LOG_ERROR,
                             "XML parsing failed: " + std::to_string(error), kDeadline));
    ExpectOnlyCallbackIsSentinel({ActiveInfo(kPackage, 1)});
    EXPECT_EQ(ListenerErrors(), 1u);
}

TEST_F(ListenerLiveTest, AttributeChangesAndReadsAreNotWatched) {
    ASSERT_EQ(chmod(list_.path().c_str(), 0600), 0);
    ASSERT_EQ(ApexUpdateListener::TrySlurpInfo(kPackage, list_.path()).has_value(), true);
    ASSERT_TRUE(observer_->WaitForRead(kDeadline));
    ExpectOnlyCallbackIsSentinel({ActiveInfo(kPackage, 1)});
    // The sentinel's write is the only event that made the listener read the list again.
    EXPECT_TRUE(observer_->WaitForRead(kDeadline));
    EXPECT_FALSE(observer_->WaitForRead(0ms));
    EXPECT_EQ(log_.Count(kLogTag, ANDROID_LOG_INFO, Modified()), 1u);
}

TEST_F(ListenerLiveTest, DestructionWithNothingPendingIsPromptAndSilent) {
    log_.Clear();
    auto destroyed = std::async(std::launch::async, [this] { listener_.reset(); });
    ASSERT_EQ(destroyed.wait_for(kDeadline), std::future_status::ready);
    for (const auto& record : log_.Records()) {
        EXPECT_NE(record.tag, kLogTag) << record.message;
    }
    EXPECT_TRUE(recorder_.Calls().empty());
}

}  // namespace
}  // namespace vyr_test::apex
