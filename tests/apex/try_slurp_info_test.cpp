// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/log.h>
#include <apex_update_listener.h>
#include <gtest/gtest.h>
#include <log_capture.h>
#include <tinyxml2.h>

#include <cstdint>
#include <limits>
#include <ostream>
#include <string>
#include <vector>

#include "apex_info_xml.h"
#include "temp_info_list.h"

namespace vyr_test::apex {
namespace {

using Info = ApexUpdateListener::Info;

class TrySlurpInfoTest : public ::testing::Test {
  protected:
    std::optional<std::set<Info>> Slurp(const std::string& content) {
        if (!list_.Write(content)) return std::nullopt;
        return ApexUpdateListener::TrySlurpInfo(kPackage, list_.path());
    }

    // The records read from a list holding one entry of the package with these attributes.
    std::vector<InfoFields> SlurpOne(Attributes attributes) {
        attributes.insert(attributes.begin(), {"moduleName", kPackage});
        auto infos = Slurp(InfoList({Entry(attributes)}));
        if (!infos) {
            ADD_FAILURE() << "no records read";
            return {};
        }
        return Fields(*infos);
    }

    // The only record of the listener's tag, which must be one error line.
    void ExpectOnlyError(const std::string& message) {
        std::vector<vyr_test::LogRecord> records;
        for (const auto& record : log_.Records()) {
            if (record.tag == kLogTag) records.push_back(record);
        }
        ASSERT_EQ(records.size(), 1u);
        EXPECT_EQ(records[0].priority, ANDROID_LOG_ERROR);
        EXPECT_EQ(records[0].message, message);
    }

    void ExpectNothingLogged() {
        for (const auto& record : log_.Records()) {
            EXPECT_NE(record.tag, kLogTag) << record.message;
        }
    }

    // The error code the XML library gives for the file as it now stands.
    int LibraryError() {
        tinyxml2::XMLDocument document;
        return document.LoadFile(list_.path().c_str());
    }

    vyr_test::LogCapture log_;
    TempInfoList list_;
};

TEST_F(TrySlurpInfoTest, ReadsEveryAttribute) {
    auto infos = Slurp(InfoList({Entry(ActiveEntry(kPackage, 42))}));
    ASSERT_TRUE(infos.has_value());
    EXPECT_EQ(Fields(*infos), Fields(std::set<Info>{ActiveInfo(kPackage, 42)}));
    ExpectNothingLogged();
}

TEST_F(TrySlurpInfoTest, FactoryOnlyEntrySortsBeforeActiveEntry) {
    auto infos = Slurp(InfoList({
        Entry({{"moduleName", kPackage},
               {"modulePath", "/data/apex/active/camera@2.apex"},
               {"versionCode", "2"},
               {"isActive", "true"}}),
        Entry({{"moduleName", kPackage},
               {"modulePath", "/vendor/apex/camera.apex"},
               {"versionCode", "1"},
               {"isFactory", "true"}}),
    }));
    ASSERT_TRUE(infos.has_value());
    EXPECT_EQ(Fields(*infos),
              (std::vector<InfoFields>{
                  {kPackage, "/vendor/apex/camera.apex", "", 1, "", true, false},
                  {kPackage, "/data/apex/active/camera@2.apex", "", 2, "", false, true},
              }));
}

TEST_F(TrySlurpInfoTest, IdenticalEntriesGiveOneRecord) {
    std::string entry = Entry(ActiveEntry(kPackage, 3));
    auto infos = Slurp(InfoList({entry, entry}));
    ASSERT_TRUE(infos.has_value());
    EXPECT_EQ(Fields(*infos), Fields(std::set<Info>{ActiveInfo(kPackage, 3)}));
}

TEST_F(TrySlurpInfoTest, EntryWithOnlyItsNameTakesDefaults) {
    EXPECT_EQ(SlurpOne({}), (std::vector<InfoFields>{{kPackage, "", "", 0, "", false, false}}));
}

TEST_F(TrySlurpInfoTest, TextIsCopiedAsItStands) {
    EXPECT_EQ(SlurpOne({{"modulePath", "  /data/apex/a b.apex "},
                        {"preinstalledModulePath", "/vendor/apex/&amp;\xc3\xa9"},
                        {"versionName", " 1.0 "}}),
              (std::vector<InfoFields>{{kPackage, "  /data/apex/a b.apex ",
                                        "/vendor/apex/&\xc3\xa9", 0, " 1.0 ", false, false}}));
}

TEST_F(TrySlurpInfoTest, OtherAttributesAndTextAreIgnored) {
    auto infos =
        Slurp("<apex-info-list><apex-info moduleName=\"" + std::string(kPackage) +
              "\" versionCode=\"5\" lastUpdateMillis=\"99\" provideSharedApexLibs=\"true\">"
              "text</apex-info></apex-info-list>");
    ASSERT_TRUE(infos.has_value());
    EXPECT_EQ(Fields(*infos), (std::vector<InfoFields>{{kPackage, "", "", 5, "", false, false}}));
}

struct VersionCodeCase {
    const char* text;
    int64_t expected;
};

void PrintTo(const VersionCodeCase& c, std::ostream* os) {
    *os << '"' << c.text << "\" -> " << c.expected;
}

class VersionCodeTest : public TrySlurpInfoTest,
                        public ::testing::WithParamInterface<VersionCodeCase> {};

TEST_P(VersionCodeTest, ReadsLeadingDecimalNumber) {
    auto fields = SlurpOne({{"versionCode", GetParam().text}});
    ASSERT_EQ(fields.size(), 1u);
    EXPECT_EQ(std::get<3>(fields[0]), GetParam().expected);
    ExpectNothingLogged();
}

INSTANTIATE_TEST_SUITE_P(
    Texts, VersionCodeTest,
    ::testing::Values(VersionCodeCase{"0x10", 0}, VersionCodeCase{" 42abc", 42},
                      VersionCodeCase{"-5", -5}, VersionCodeCase{"+7", 7}, VersionCodeCase{"", 0},
                      VersionCodeCase{"abc", 0}, VersionCodeCase{"010", 10},
                      VersionCodeCase{"99999999999999999999", std::numeric_limits<int64_t>::max()},
                      VersionCodeCase{"-99999999999999999999", std::numeric_limits<int64_t>::min()},
                      VersionCodeCase{"9223372036854775807", std::numeric_limits<int64_t>::max()}));

struct FlagCase {
    const char* text;
    bool expected;
};

void PrintTo(const FlagCase& c, std::ostream* os) {
    *os << '"' << c.text << "\" -> " << c.expected;
}

class FlagTest : public TrySlurpInfoTest, public ::testing::WithParamInterface<FlagCase> {};

TEST_P(FlagTest, OnlyExactTrueIsTrue) {
    auto active = SlurpOne({{"isActive", GetParam().text}});
    ASSERT_EQ(active.size(), 1u);
    EXPECT_EQ(std::get<6>(active[0]), GetParam().expected);
    EXPECT_FALSE(std::get<5>(active[0]));

    auto factory = SlurpOne({{"isFactory", GetParam().text}});
    ASSERT_EQ(factory.size(), 1u);
    EXPECT_EQ(std::get<5>(factory[0]), GetParam().expected);
    EXPECT_FALSE(std::get<6>(factory[0]));
}

INSTANTIATE_TEST_SUITE_P(Texts, FlagTest,
                         ::testing::Values(FlagCase{"true", true}, FlagCase{"TRUE", false},
                                           FlagCase{"True", false}, FlagCase{"1", false},
                                           FlagCase{"yes", false}, FlagCase{"", false},
                                           FlagCase{" true", false}, FlagCase{"true ", false},
                                           FlagCase{"false", false}),
                         [](const auto& info) { return "Case" + std::to_string(info.index); });

TEST_F(TrySlurpInfoTest, OtherPackagesNeverAppear) {
    Attributes other = ActiveEntry(kOtherPackage, 9);
    Attributes prefixed = ActiveEntry(std::string(kPackage) + ".v2", 8);
    auto infos = Slurp(InfoList({Entry(other), Entry(ActiveEntry(kPackage, 1)), Entry(prefixed),
                                 Entry({{"versionCode", "4"}})}));
    ASSERT_TRUE(infos.has_value());
    EXPECT_EQ(Fields(*infos), Fields(std::set<Info>{ActiveInfo(kPackage, 1)}));
}

TEST_F(TrySlurpInfoTest, NameInOtherLetterCaseIsSkipped) {
    auto infos =
        Slurp(InfoList({Entry({{"moduleName", "com.tarven.nomil.Camera.hal"}, {"versionCode", "2"}}),
                        Entry({{"moduleName", kPackage}, {"versionCode", "1"}})}));
    ASSERT_TRUE(infos.has_value());
    EXPECT_EQ(Fields(*infos), (std::vector<InfoFields>{{kPackage, "", "", 1, "", false, false}}));
}

TEST_F(TrySlurpInfoTest, OnlyEntryInOtherLetterCaseFails) {
    EXPECT_FALSE(
        Slurp(InfoList({Entry({{"moduleName", "COM.TARVEN.NOMIL.CAMERA.HAL"}})})).has_value());
    ExpectOnlyError("XML did not contain any apex-info about com.tarven.nomil.camera.hal");
}

TEST_F(TrySlurpInfoTest, ListWithoutThePackageFails) {
    EXPECT_FALSE(Slurp(InfoList({Entry(ActiveEntry(kOtherPackage, 1))})).has_value());
    ExpectOnlyError("XML did not contain any apex-info about com.tarven.nomil.camera.hal");
}

TEST_F(TrySlurpInfoTest, EmptyListFails) {
    EXPECT_FALSE(Slurp("<apex-info-list/>").has_value());
    ExpectOnlyError("XML did not contain any apex-info about com.tarven.nomil.camera.hal");
}

TEST_F(TrySlurpInfoTest, EntriesOutsideTheListLevelAreNotVisited) {
    const std::string name = "moduleName=\"" + std::string(kPackage) + "\"";
    auto infos = Slurp(
        "<apex-info-list>\n"
        "  <apex-infos " +
        name +
        " versionCode=\"7\"/>\n"
        "  <group><apex-info " +
        name +
        " versionCode=\"9\"/></group>\n"
        "  <apex-info " +
        name +
        " versionCode=\"1\">\n"
        "    <apex-info " +
        name +
        " versionCode=\"8\"/>\n"
        "  </apex-info>\n"
        "  <info " +
        name +
        " versionCode=\"6\"/>\n"
        "</apex-info-list>\n");
    ASSERT_TRUE(infos.has_value());
    EXPECT_EQ(Fields(*infos), (std::vector<InfoFields>{{kPackage, "", "", 1, "", false, false}}));
}

TEST_F(TrySlurpInfoTest, OnlyTheFirstListIsRead) {
    EXPECT_FALSE(Slurp("<apex-info-list/>\n<apex-info-list>" + Entry(ActiveEntry(kPackage, 1)) +
                       "</apex-info-list>\n")
                     .has_value());
    ExpectOnlyError("XML did not contain any apex-info about com.tarven.nomil.camera.hal");
}

TEST_F(TrySlurpInfoTest, OtherTopElementFails) {
    EXPECT_FALSE(
        Slurp("<apex-infos>" + Entry(ActiveEntry(kPackage, 1)) + "</apex-infos>").has_value());
    ExpectOnlyError("XML did not contain apex-info-list");
}

TEST_F(TrySlurpInfoTest, NestedListFails) {
    EXPECT_FALSE(Slurp("<apex><apex-info-list>" + Entry(ActiveEntry(kPackage, 1)) +
                       "</apex-info-list></apex>")
                     .has_value());
    ExpectOnlyError("XML did not contain apex-info-list");
}

TEST_F(TrySlurpInfoTest, EmptyFileFails) {
    EXPECT_FALSE(Slurp("").has_value());
    int error = LibraryError();
    EXPECT_NE(error, tinyxml2::XML_SUCCESS);
    ExpectOnlyError("XML parsing failed: " + std::to_string(error));
}

TEST_F(TrySlurpInfoTest, TruncatedFileFails) {
    std::string whole = InfoList({Entry(ActiveEntry(kPackage, 1))});
    EXPECT_FALSE(Slurp(whole.substr(0, whole.size() / 2)).has_value());
    int error = LibraryError();
    EXPECT_NE(error, tinyxml2::XML_SUCCESS);
    ExpectOnlyError("XML parsing failed: " + std::to_string(error));
}

TEST_F(TrySlurpInfoTest, EveryTruncationOfAListFailsOrHoldsNoEntry) {
    // A file caught half-written must never yield part of the records.
    std::string whole = InfoList({Entry(ActiveEntry(kOtherPackage, 1)),
                                  Entry(ActiveEntry(kPackage, 1)), Entry(ActiveEntry(kPackage, 2))});
    // Only the new line after the closing tag may be missing from a complete list.
    size_t complete = whole.rfind('>') + 1;
    for (size_t length = 0; length < complete; ++length) {
        TempInfoList list;
        ASSERT_TRUE(list.Write(whole.substr(0, length)));
        EXPECT_FALSE(ApexUpdateListener::TrySlurpInfo(kPackage, list.path()).has_value()) << length;
    }
}

TEST_F(TrySlurpInfoTest, MissingFileFails) {
    EXPECT_FALSE(
        ApexUpdateListener::TrySlurpInfo(kPackage, list_.directory() + "/absent.xml").has_value());
    ExpectOnlyError("XML parsing failed: " + std::to_string(tinyxml2::XML_ERROR_FILE_NOT_FOUND));
}

TEST_F(TrySlurpInfoTest, DirectoryFails) {
    EXPECT_FALSE(ApexUpdateListener::TrySlurpInfo(kPackage, list_.directory()).has_value());
    tinyxml2::XMLDocument document;
    int error = document.LoadFile(list_.directory().c_str());
    EXPECT_NE(error, tinyxml2::XML_SUCCESS);
    ExpectOnlyError("XML parsing failed: " + std::to_string(error));
}

}  // namespace
}  // namespace vyr_test::apex
