// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensors_sim/scenario.h"

#include <android/log.h>
#include <gtest/gtest.h>

#include <string>

#include "log_capture.h"
#include "temp_dir.h"

namespace vyr_test::sensors {
namespace {

using sensors_sim::LoadScenario;
using sensors_sim::ParseScenarioFile;
using sensors_sim::Scenario;

// The options other than a recording to replay, as "name=value" in the file's spelling, so that
// one comparison shows every option that differs.
std::string Options(const Scenario& s) {
    return "als.create_fails=" + std::to_string(s.als_create_fails) +
           " range.create_fails=" + std::to_string(s.range_create_fails) +
           " range.init_fails=" + std::to_string(s.range_init_fails) +
           " invalid_every=" + std::to_string(s.invalid_every) +
           " extra_latency_ms=" + std::to_string(s.extra_latency_ms) +
           " zone_count=" + std::to_string(s.zone_count) + " seed=" + std::to_string(s.seed);
}

void ExpectDefaults(const Scenario& s) {
    EXPECT_EQ(Options(s),
              "als.create_fails=0 range.create_fails=0 range.init_fails=0 invalid_every=0 "
              "extra_latency_ms=0 zone_count=4 seed=1");
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
    EXPECT_EQ(Options(s),
              "als.create_fails=1 range.create_fails=1 range.init_fails=1 invalid_every=5 "
              "extra_latency_ms=250 zone_count=2 seed=123456789012");
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
