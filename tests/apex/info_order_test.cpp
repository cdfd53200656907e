// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <apex_update_listener.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <limits>
#include <set>
#include <string>
#include <vector>

#include "apex_info_xml.h"

namespace vyr_test::apex {
namespace {

using Info = ApexUpdateListener::Info;

bool Equivalent(const Info& a, const Info& b) {
    return !(a < b) && !(b < a);
}

// Raises one field of a record above its value in Low().
using Raise = std::function<void(Info&)>;

struct OrderedField {
    const char* name;
    Raise raise;
};

// Every field at its smallest value except module_name, which a record always carries.
Info Low() {
    Info info;
    info.module_name = "a";
    return info;
}

// The fields in the order that decides between two records.
const std::vector<OrderedField>& DecidingOrder() {
    static const std::vector<OrderedField> order = {
        {"is_active", [](Info& i) { i.is_active = true; }},
        {"is_factory", [](Info& i) { i.is_factory = true; }},
        {"version_code", [](Info& i) { i.version_code = 1; }},
        {"version_name", [](Info& i) { i.version_name = "b"; }},
        {"module_path", [](Info& i) { i.module_path = "b"; }},
        {"preinstalled_module_path", [](Info& i) { i.preinstalled_module_path = "b"; }},
        {"module_name", [](Info& i) { i.module_name = "b"; }},
    };
    return order;
}

TEST(InfoOrderTest, IdenticalRecordsAreEquivalent) {
    Info a = ActiveInfo(kPackage, 7);
    Info b = ActiveInfo(kPackage, 7);
    EXPECT_FALSE(a < b);
    EXPECT_FALSE(b < a);
}

TEST(InfoOrderTest, EachFieldAloneDecides) {
    for (const auto& field : DecidingOrder()) {
        SCOPED_TRACE(field.name);
        Info low = Low();
        Info high = Low();
        field.raise(high);
        EXPECT_TRUE(low < high);
        EXPECT_FALSE(high < low);
    }
}

TEST(InfoOrderTest, EarlierFieldOutweighsEveryLaterOne) {
    const auto& order = DecidingOrder();
    for (size_t i = 0; i < order.size(); ++i) {
        SCOPED_TRACE(order[i].name);
        // `high` wins only on field i; `low` wins on every later field.
        Info high = Low();
        order[i].raise(high);
        Info low = Low();
        for (size_t j = i + 1; j < order.size(); ++j) order[j].raise(low);
        EXPECT_TRUE(low < high);
        EXPECT_FALSE(high < low);
    }
}

TEST(InfoOrderTest, FactoryOnlyRecordSortsBeforeActiveOne) {
    Info factory = Low();
    factory.is_factory = true;
    factory.version_code = 100;
    Info active = Low();
    active.is_active = true;
    EXPECT_TRUE(factory < active);
    EXPECT_FALSE(active < factory);
}

TEST(InfoOrderTest, VersionCodeComparesAsSigned64Bit) {
    Info negative = Low();
    negative.version_code = -1;
    Info zero = Low();
    Info lowest = Low();
    lowest.version_code = std::numeric_limits<int64_t>::min();
    Info highest = Low();
    highest.version_code = std::numeric_limits<int64_t>::max();
    EXPECT_TRUE(negative < zero);
    EXPECT_TRUE(lowest < negative);
    EXPECT_TRUE(zero < highest);
    EXPECT_FALSE(highest < lowest);
}

TEST(InfoOrderTest, StringsCompareAsUnsignedBytes) {
    Info ascii = Low();
    ascii.version_name = "z";
    Info high_byte = Low();
    high_byte.version_name = "\x80";
    EXPECT_TRUE(ascii < high_byte);
    EXPECT_FALSE(high_byte < ascii);
}

TEST(InfoOrderTest, ShorterStringSortsFirstOnCommonPrefix) {
    Info shorter = Low();
    shorter.module_path = "/apex/a";
    Info longer = Low();
    longer.module_path = "/apex/a\x01";
    Info empty = Low();
    EXPECT_TRUE(shorter < longer);
    EXPECT_FALSE(longer < shorter);
    EXPECT_TRUE(empty < shorter);
}

TEST(InfoOrderTest, SetCollapsesEquivalentRecordsAndKeepsOrder) {
    Info active = ActiveInfo(kPackage, 2);
    Info factory = ActiveInfo(kPackage, 1);
    factory.is_active = false;
    factory.is_factory = true;
    std::set<Info> infos = {active, factory, active, ActiveInfo(kPackage, 2)};
    ASSERT_EQ(infos.size(), 2u);
    EXPECT_TRUE(Equivalent(*infos.begin(), factory));
    EXPECT_TRUE(Equivalent(*infos.rbegin(), active));
}

}  // namespace
}  // namespace vyr_test::apex
