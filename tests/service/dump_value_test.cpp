// The dump's value tree: the same values as text for a person and as JSON for a script.

#include "dump_value.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

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
              "name: a \"quoted\"\\path\n\n"
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

}  // namespace
