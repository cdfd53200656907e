// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <cutils/properties.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <string>

#include "test_files.h"

namespace vyr_test::properties {
namespace {

constexpr char kKey[] = "persist.vendor.camera.vyr_supported";

// Points VYR_PROPERTY_FILE at a private file for one test and restores the environment after.
class HostPropertiesTest : public ::testing::Test {
  protected:
    void SetUp() override {
        dir_ = vyr_test::MakeTempDir("vyr_properties_");
        ASSERT_FALSE(dir_.empty());
        path_ = dir_ + "/build.prop";
        setenv("VYR_PROPERTY_FILE", path_.c_str(), 1);
    }

    void TearDown() override {
        unsetenv("VYR_PROPERTY_FILE");
        unlink(path_.c_str());
        rmdir(dir_.c_str());
    }

    void Write(const std::string& contents) {
        std::ofstream file(path_, std::ios::trunc);
        file << contents;
    }

    int8_t BoolFor(const std::string& value, int8_t default_value) {
        Write(std::string(kKey) + "=" + value + "\n");
        return property_get_bool(kKey, default_value);
    }

    std::string dir_;
    std::string path_;
};

TEST_F(HostPropertiesTest, EveryTrueSpellingIsTrue) {
    for (const char* value : {"1", "y", "yes", "on", "true"}) {
        EXPECT_EQ(BoolFor(value, 0), 1) << value;
    }
}

TEST_F(HostPropertiesTest, EveryFalseSpellingIsFalse) {
    for (const char* value : {"0", "n", "no", "off", "false"}) {
        EXPECT_EQ(BoolFor(value, 1), 0) << value;
    }
}

TEST_F(HostPropertiesTest, OtherValuesGiveTheDefault) {
    for (const char* value :
         {"", "2", "TRUE", "Yes", "ON", "False", "enabled", " on", "on ", "-1", "truex"}) {
        EXPECT_EQ(BoolFor(value, 1), 1) << '"' << value << '"';
        EXPECT_EQ(BoolFor(value, 0), 0) << '"' << value << '"';
    }
}

TEST_F(HostPropertiesTest, AbsentFileGivesTheDefault) {
    EXPECT_EQ(property_get_bool(kKey, 1), 1);
    EXPECT_EQ(property_get_bool(kKey, 0), 0);
}

TEST_F(HostPropertiesTest, UnsetVariableGivesTheDefault) {
    Write(std::string(kKey) + "=true\n");
    unsetenv("VYR_PROPERTY_FILE");
    EXPECT_EQ(property_get_bool(kKey, 0), 0);
}

TEST_F(HostPropertiesTest, AbsentKeyGivesTheDefault) {
    Write("persist.vendor.camera.vyr_range_supported=false\nother=1\n");
    EXPECT_EQ(property_get_bool(kKey, 1), 1);
    EXPECT_EQ(property_get_bool(kKey, 0), 0);
}

TEST_F(HostPropertiesTest, NullKeyGivesTheDefault) {
    Write("a=1\n");
    EXPECT_EQ(property_get_bool(nullptr, 1), 1);
}

TEST_F(HostPropertiesTest, CommentsAndBlankLinesAreSkipped) {
    Write(std::string("# ") + kKey + "=true\n\n   \n  #" + kKey + "=1\n");
    EXPECT_EQ(property_get_bool(kKey, 0), 0);
}

TEST_F(HostPropertiesTest, WhitespaceAroundTheKeyIsTolerated) {
    Write(std::string("  ") + kKey + " \t=yes\n");
    EXPECT_EQ(property_get_bool(kKey, 0), 1);
}

TEST_F(HostPropertiesTest, KeyMustMatchWhole) {
    Write(std::string(kKey) + "x=1\nx" + kKey + "=1\n");
    EXPECT_EQ(property_get_bool(kKey, 0), 0);
}

TEST_F(HostPropertiesTest, LineWithoutEqualsIsIgnored) {
    Write(std::string(kKey) + " true\n" + kKey + "=on\n");
    EXPECT_EQ(property_get_bool(kKey, 0), 1);
}

TEST_F(HostPropertiesTest, LaterLineWins) {
    Write(std::string(kKey) + "=1\n" + kKey + "=0\n");
    EXPECT_EQ(property_get_bool(kKey, 1), 0);
}

TEST_F(HostPropertiesTest, CrLfLineEndsAreAccepted) {
    Write(std::string(kKey) + "=on\r\n");
    EXPECT_EQ(property_get_bool(kKey, 0), 1);
}

TEST_F(HostPropertiesTest, LastLineWithoutNewlineIsRead) {
    Write(std::string(kKey) + "=true");
    EXPECT_EQ(property_get_bool(kKey, 0), 1);
}

TEST_F(HostPropertiesTest, ValueMayContainEquals) {
    Write("ro.example=a=b\n");
    char value[PROPERTY_VALUE_MAX];
    EXPECT_EQ(property_get("ro.example", value, "none"), 3);
    EXPECT_STREQ(value, "a=b");
}

TEST_F(HostPropertiesTest, PropertyGetReturnsTheValueAndItsLength) {
    Write("ro.example=hello world\n");
    char value[PROPERTY_VALUE_MAX];
    EXPECT_EQ(property_get("ro.example", value, "none"), 11);
    EXPECT_STREQ(value, "hello world");
}

TEST_F(HostPropertiesTest, PropertyGetUsesTheDefaultForAbsentOrEmpty) {
    Write("ro.empty=\n");
    char value[PROPERTY_VALUE_MAX];
    EXPECT_EQ(property_get("ro.empty", value, "fallback"), 8);
    EXPECT_STREQ(value, "fallback");
    EXPECT_EQ(property_get("ro.absent", value, nullptr), 0);
    EXPECT_STREQ(value, "");
}

TEST_F(HostPropertiesTest, PropertyGetTruncatesLongValues) {
    Write("ro.long=" + std::string(200, 'x') + "\n");
    char value[PROPERTY_VALUE_MAX];
    EXPECT_EQ(property_get("ro.long", value, nullptr), PROPERTY_VALUE_MAX - 1);
    EXPECT_EQ(std::string(value), std::string(PROPERTY_VALUE_MAX - 1, 'x'));
}

TEST_F(HostPropertiesTest, IntegersParseLikeThePlatform) {
    Write(
        "dec=42\nneg=-7\nhex=0x10\noct=010\ntail=12abc\nword=abc\nempty=\nbig=4294967296\n"
        "huge=99999999999999999999\n");
    EXPECT_EQ(property_get_int32("dec", -1), 42);
    EXPECT_EQ(property_get_int32("neg", -1), -7);
    EXPECT_EQ(property_get_int32("hex", -1), 16);
    EXPECT_EQ(property_get_int32("oct", -1), 8);
    EXPECT_EQ(property_get_int32("tail", -1), 12);
    EXPECT_EQ(property_get_int32("word", -1), -1);
    EXPECT_EQ(property_get_int32("empty", -1), -1);
    EXPECT_EQ(property_get_int32("absent", -1), -1);
    EXPECT_EQ(property_get_int32("big", -1), -1) << "outside 32 bits";
    EXPECT_EQ(property_get_int64("big", -1), 4294967296LL);
    EXPECT_EQ(property_get_int64("huge", -1), -1) << "overflow";
    EXPECT_EQ(property_get_int64(nullptr, 5), 5);
}

}  // namespace
}  // namespace vyr_test::properties
