// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensors_sim/scenario.h"

#include <android/log.h>
#include <gtest/gtest.h>

#include "log_capture.h"
#include "temp_dir.h"

namespace vyr_test::sensors {
namespace {

using sensors_sim::LoadScenario;
using sensors_sim::ParseScenarioFile;
using sensors_sim::Scenario;

void ExpectDefaults(const Scenario& s) {
    EXPECT_FALSE(s.als_create_fails);
    EXPECT_FALSE(s.range_create_fails);
    EXPECT_FALSE(s.range_init_fails);
    EXPECT_EQ(s.invalid_every, 0);
    EXPECT_EQ(s.extra_latency_ms, 0);
    EXPECT_EQ(s.zone_count, 4);
    EXPECT_EQ(s.seed, 1u);
}

TEST(ScenarioTest, UnsetVariableGivesDefaults) {
    unsetenv(sensors_sim::kScenarioVariable);
    ExpectDefaults(LoadScenario());
}

TEST(ScenarioTest, EveryOptionIsRead) {
    TempDir dir;
    const std::string path = dir.Write("scenario",
                                       "als.create_fails=1\n"
                                       "range.create_fails=true\n"
                                       "range.init_fails=yes\n"
                                       "invalid_every=5\n"
                                       "extra_latency_ms=250\n"
                                       "zone_count=2\n"
                                       "seed=123456789012\n");
    setenv(sensors_sim::kScenarioVariable, path.c_str(), 1);
    const Scenario s = LoadScenario();
    unsetenv(sensors_sim::kScenarioVariable);
    EXPECT_TRUE(s.als_create_fails);
    EXPECT_TRUE(s.range_create_fails);
    EXPECT_TRUE(s.range_init_fails);
    EXPECT_EQ(s.invalid_every, 5);
    EXPECT_EQ(s.extra_latency_ms, 250);
    EXPECT_EQ(s.zone_count, 2);
    EXPECT_EQ(s.seed, 123456789012u);
}

TEST(ScenarioTest, CommentsBlankLinesAndWhitespaceAreAccepted) {
    TempDir dir;
    const std::string path = dir.Write("scenario",
                                       "# a comment\n"
                                       "\n"
                                       "   # indented comment\n"
                                       "  zone_count =  0  \n"
                                       "\tseed\t=\t9\r\n"
                                       "range.init_fails = 0\n");
    vyr_test::LogCapture log;
    const Scenario s = ParseScenarioFile(path);
    EXPECT_EQ(s.zone_count, 0);
    EXPECT_EQ(s.seed, 9u);
    EXPECT_FALSE(s.range_init_fails);
    EXPECT_TRUE(log.Records().empty());
}

TEST(ScenarioTest, BadLinesAreLoggedAndKeepDefaults) {
    TempDir dir;
    const std::string path = dir.Write("scenario",
                                       "zone_count=5\n"
                                       "zone_count=-1\n"
                                       "invalid_every=often\n"
                                       "extra_latency_ms=-3\n"
                                       "seed=-1\n"
                                       "als.create_fails=maybe\n"
                                       "colour=blue\n"
                                       "no equals sign\n");
    vyr_test::LogCapture log;
    ExpectDefaults(ParseScenarioFile(path));
    EXPECT_TRUE(
        log.Contains("sensors_sim", ANDROID_LOG_WARN, path + ":1: ignoring \"zone_count=5\""));
    EXPECT_TRUE(
        log.Contains("sensors_sim", ANDROID_LOG_WARN, path + ":7: ignoring \"colour=blue\""));
    EXPECT_TRUE(
        log.Contains("sensors_sim", ANDROID_LOG_WARN, path + ":8: ignoring \"no equals sign\""));
    EXPECT_EQ(log.Records().size(), 8u);
}

TEST(ScenarioTest, GoodLinesSurviveBadOnes) {
    TempDir dir;
    const std::string path = dir.Write("scenario", "zone_count=9\nzone_count=3\nseed=x\n");
    EXPECT_EQ(ParseScenarioFile(path).zone_count, 3);
}

TEST(ScenarioTest, MissingFileGivesDefaultsAndAWarning) {
    TempDir dir;
    vyr_test::LogCapture log;
    ExpectDefaults(ParseScenarioFile(dir.Path("absent")));
    EXPECT_TRUE(
        log.Contains("sensors_sim", ANDROID_LOG_WARN,
                     "cannot read scenario file " + dir.Path("absent") + ", using defaults"));
}

}  // namespace
}  // namespace vyr_test::sensors
