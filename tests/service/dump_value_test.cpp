// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The dump's value tree: the same values as text for a person and as JSON for a script.

#include "dump_value.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

namespace vyr_test::service {
namespace {

using android::vyr::binder::DumpValue;

DumpValue Sample() {
    DumpValue root = DumpValue::Object();
    root.Set("name", "a \"quoted\"\\path\n");
    root.Set("count", int64_t{-3});
    root.Set("on", true);
    root.Set("unknown", DumpValue());
    root.Set("empty", DumpValue::Array());
    DumpValue& items = root.Set("items", DumpValue::Array());
    DumpValue& first = items.Append(DumpValue::Object());
    first.Set("id", 1);
    first.Set("period", 100);
    items.Append(7);
    DumpValue& nested = root.Set("nested", DumpValue::Object());
    nested.Set("deep", DumpValue::Object()).Set("x", uint64_t{5});
    return root;
}

TEST(DumpValueTest, TextIndentsNestedValuesAndMarksListItems) {
    EXPECT_EQ(Sample().ToText(),
              "name: a \"quoted\"\\path\\x0a\n"
              "count: -3\n"
              "on: yes\n"
              "unknown: -\n"
              "empty: none\n"
              "items:\n"
              "  - id: 1\n"
              "    period: 100\n"
              "  - 7\n"
              "nested:\n"
              "  deep:\n"
              "    x: 5\n");
}

TEST(DumpValueTest, JsonParsesBackToTheSameValues) {
    const nlohmann::json parsed = nlohmann::json::parse(Sample().ToJson());
    EXPECT_EQ(parsed["name"], "a \"quoted\"\\path\n");
    EXPECT_EQ(parsed["count"], -3);
    EXPECT_EQ(parsed["on"], true);
    EXPECT_TRUE(parsed["unknown"].is_null());
    EXPECT_TRUE(parsed["empty"].is_array());
    EXPECT_EQ(parsed["items"][0]["period"], 100);
    EXPECT_EQ(parsed["items"][1], 7);
    EXPECT_EQ(parsed["nested"]["deep"]["x"], 5);
}

TEST(DumpValueTest, ControlCharactersAreEscapedInJson) {
    DumpValue root = DumpValue::Object();
    root.Set("raw", std::string("a\x01z", 3));
    EXPECT_EQ(root.ToJson(), "{\"raw\":\"a\\u0001z\"}");
}

// Bytes as a module path or a display state may hold them: UTF-8, and not.
const std::string kMixed =
    "caf\xc3\xa9 \xf0\x9f\x98\x80"  // well formed: kept
    " \xff"                         // never a UTF-8 byte
    " \xc3"                         // a sequence cut short
    " \xc0\x80"                     // overlong form of NUL
    " \xed\xa0\x80"                 // a surrogate
    " \xf4\x90\x80\x80";            // above U+10FFFF

TEST(DumpValueTest, JsonIsValidUtf8WhateverTheBytes) {
    DumpValue root = DumpValue::Object();
    root.Set("path", kMixed);
    root.Set(std::string("key\xfe"), 1);
    const std::string json = root.ToJson();
    nlohmann::json parsed;
    // nlohmann's parser rejects anything that is not UTF-8.
    ASSERT_NO_THROW(parsed = nlohmann::json::parse(json)) << json;
    const std::string replacement = "\xef\xbf\xbd";
    EXPECT_EQ(parsed["path"], "caf\xc3\xa9 \xf0\x9f\x98\x80 " + replacement + " " + replacement +
                                  " " + replacement + replacement + " " + replacement +
                                  replacement + replacement + " " + replacement + replacement +
                                  replacement + replacement);
    EXPECT_EQ(parsed["key" + replacement], 1);
}

TEST(DumpValueTest, TextShowsBytesThatAreNotUtf8AndControlsAsEscapes) {
    DumpValue root = DumpValue::Object();
    root.Set("path", kMixed);
    root.Set("state", std::string("On\tX\x7f", 5));
    EXPECT_EQ(root.ToText(),
              "path: caf\xc3\xa9 \xf0\x9f\x98\x80 \\xff \\xc3 \\xc0\\x80 \\xed\\xa0\\x80 "
              "\\xf4\\x90\\x80\\x80\n"
              "state: On\\x09X\\x7f\n");
}

}  // namespace
}  // namespace vyr_test::service
