// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Unit tests of vyrctl's parsing, decoding and shell, against an in-process fake service.

#include <aidl/android/vyr/BnVYRService.h>
#include <android-base/file.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <vector>

#include "demo_screen.h"
#include "event_format.h"
#include "line_writer.h"
#include "options.h"
#include "shell.h"
#include "test_files.h"

namespace vyr_test::vyrctl {
namespace {

using namespace ::vyrctl;

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;

// Answers every call with fixed results and records what it was asked.
class FakeService : public aidl::android::vyr::BnVYRService {
  public:
    ndk::ScopedAStatus Open(int32_t mode, int32_t* result) override {
        calls.push_back("Open " + std::to_string(mode));
        *result = mode == 3 ? 42 : -22;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Close(int32_t handle) override {
        calls.push_back("Close " + std::to_string(handle));
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Enable(int32_t handle, int32_t period, int32_t* result) override {
        calls.push_back("Enable " + std::to_string(handle) + " " + std::to_string(period));
        *result = 0;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Disable(int32_t handle) override {
        calls.push_back("Disable " + std::to_string(handle));
        return ndk::ScopedAStatus::ok();
    }
    // Delivers one event at once, as a running service would soon after.
    ndk::ScopedAStatus SetCallback(int32_t, const std::shared_ptr<IEventCallback>& callback,
                                   int32_t* result) override {
        Event event{};
        event.timestamp = 5;
        event.data = {1.5f};
        callback->OnEvent(event);
        *result = 0;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus EnableLowPower(int32_t, bool, int32_t* result) override {
        *result = -22;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus EnableOnSample(int32_t, int32_t, int32_t, int32_t* result) override {
        *result = -38;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Flush(int32_t, int32_t* result) override {
        *result = -38;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus EnableRing(int32_t, int32_t, ndk::ScopedFileDescriptor*,
                                  int32_t* result) override {
        *result = -38;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus PollOnce(int32_t handle, Event* event, int32_t* result) override {
        if (handle != 42) {
            *result = -61;
            return ndk::ScopedAStatus::ok();
        }
        event->status = 0xAB;
        event->timestamp = 123;
        event->value0 = 0.5f;
        event->value1 = -2;
        event->data = {1, 2.25f};
        *result = 0;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus ConfigureParameters(int32_t, const std::vector<int32_t>& params,
                                           int32_t* result) override {
        calls.push_back("ConfigureParameters " + std::to_string(params.size()));
        *result = params.size() == 11 ? 0 : -22;
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus SetTorchLightState(int32_t state) override {
        calls.push_back("SetTorchLightState " + std::to_string(state));
        return ndk::ScopedAStatus::ok();
    }

    std::vector<std::string> calls;
};

// Runs shell input against the fake and returns its output lines.
class ShellTest : public ::testing::Test {
  protected:
    std::vector<std::string> RunLines(const std::vector<std::string>& input) {
        FILE* out = tmpfile();
        FILE* err = tmpfile();
        {
            LineWriter out_writer(out);
            LineWriter err_writer(err);
            Shell shell(service_, &out_writer, &err_writer);
            for (const auto& line : input) {
                if (!shell.Execute(line)) break;
            }
            shell.ReleaseLeftovers();
        }
        std::vector<std::string> lines = ReadLines(out);
        err_lines_ = ReadLines(err);
        fclose(out);
        fclose(err);
        return lines;
    }

    static std::vector<std::string> ReadLines(FILE* file) {
        // Writes out what the stream still holds and goes back to the start of the file.
        rewind(file);
        std::string text;
        EXPECT_TRUE(android::base::ReadFdToString(fileno(file), &text));
        return SplitLines(text);
    }

    std::shared_ptr<FakeService> service_ = ndk::SharedRefBase::make<FakeService>();
    std::vector<std::string> err_lines_;
};

TEST(OptionsTest, ParseInt32AcceptsOnlyWholeNumbersInRange) {
    EXPECT_EQ(ParseInt32("12"), 12);
    EXPECT_EQ(ParseInt32("-5"), -5);
    EXPECT_EQ(ParseInt32("0x10"), 16);
    EXPECT_EQ(ParseInt32("2147483647"), 2147483647);
    EXPECT_FALSE(ParseInt32("2147483648"));
    EXPECT_FALSE(ParseInt32(""));
    EXPECT_FALSE(ParseInt32("12a"));
    EXPECT_FALSE(ParseInt32(" 1"));
    EXPECT_FALSE(ParseInt32("abc"));
}

TEST(OptionsTest, StreamOptions) {
    StreamOptions options;
    std::string error;
    ASSERT_TRUE(ParseStreamOptions(
        {"range", "--callback", "--period", "100", "--count", "5", "--json"}, &options, &error))
        << error;
    EXPECT_EQ(options.mode, kModeRange);
    EXPECT_TRUE(options.use_callback);
    EXPECT_EQ(options.period_ms, 100);
    EXPECT_EQ(options.count, 5);
    EXPECT_TRUE(options.json);
    EXPECT_EQ(options.interface_version, 2);
    ASSERT_TRUE(ParseStreamOptions({"range", "--interface", "1"}, &options, &error)) << error;
    EXPECT_EQ(options.interface_version, 1);
    EXPECT_EQ(options.callback_delay_ms, 0);
    ASSERT_TRUE(
        ParseStreamOptions({"range", "--callback", "--callback-delay", "50"}, &options, &error))
        << error;
    EXPECT_EQ(options.callback_delay_ms, 50);

    StreamOptions bad;
    EXPECT_FALSE(ParseStreamOptions({"als", "--interface", "3"}, &bad, &error));
    EXPECT_FALSE(ParseStreamOptions({"als", "--interface", "0"}, &bad, &error));
    EXPECT_FALSE(ParseStreamOptions({"sonar"}, &bad, &error));
    EXPECT_FALSE(ParseStreamOptions({"als", "--period", "0"}, &bad, &error));
    EXPECT_FALSE(ParseStreamOptions({"als", "--callback", "--poll"}, &bad, &error));
    EXPECT_FALSE(ParseStreamOptions({"als", "--count"}, &bad, &error));
    EXPECT_FALSE(ParseStreamOptions({"als", "--seconds", "-1"}, &bad, &error));
    EXPECT_FALSE(ParseStreamOptions({"als", "--fast"}, &bad, &error));
    StreamOptions polled;
    EXPECT_FALSE(ParseStreamOptions({"als", "--callback-delay", "50"}, &polled, &error))
        << "a delay needs a callback";
    EXPECT_EQ(error, "--callback-delay needs --callback");
    EXPECT_FALSE(ParseStreamOptions({"als", "--callback", "--callback-delay", "0"}, &bad, &error));
}

TEST(OptionsTest, RingOptions) {
    RingOptions options;
    std::string error;
    ASSERT_TRUE(ParseRingOptions({"light", "--period", "20", "--seconds", "2.5", "--json"},
                                 &options, &error))
        << error;
    EXPECT_EQ(options.mode, kModeAls);
    EXPECT_EQ(options.period_ms, 20);
    EXPECT_DOUBLE_EQ(options.seconds.value_or(0), 2.5);
    EXPECT_TRUE(options.json);
    RingOptions plain;
    ASSERT_TRUE(ParseRingOptions({"range"}, &plain, &error)) << error;
    EXPECT_EQ(plain.mode, kModeRange);
    EXPECT_EQ(plain.period_ms, 100);
    EXPECT_FALSE(plain.seconds);
    EXPECT_FALSE(plain.json);
    RingOptions bad;
    EXPECT_FALSE(ParseRingOptions({}, &bad, &error));
    EXPECT_EQ(error, "ring needs a sensor: als or range");
    EXPECT_FALSE(ParseRingOptions({"sonar"}, &bad, &error));
    EXPECT_FALSE(ParseRingOptions({"range", "--period", "0"}, &bad, &error));
    EXPECT_FALSE(ParseRingOptions({"range", "--period"}, &bad, &error));
    EXPECT_FALSE(ParseRingOptions({"range", "--seconds", "-1"}, &bad, &error));
    EXPECT_FALSE(ParseRingOptions({"range", "--callback"}, &bad, &error));
    EXPECT_EQ(error, "unknown ring option '--callback'");
    EXPECT_FALSE(ParseRingOptions({"range", "--count", "3"}, &bad, &error));
}

TEST(OptionsTest, GlobalTimeoutAnywhere) {
    GlobalOptions options;
    std::string error;
    ASSERT_TRUE(ParseGlobalOptions({"torch", "--timeout", "2.5", "1"}, &options, &error));
    EXPECT_EQ(options.command, "torch");
    EXPECT_DOUBLE_EQ(options.timeout_s, 2.5);
    EXPECT_EQ(options.args, std::vector<std::string>{"1"});
    GlobalOptions none;
    EXPECT_FALSE(ParseGlobalOptions({}, &none, &error));
    EXPECT_FALSE(ParseGlobalOptions({"--timeout", "x", "shell"}, &none, &error));
}

TEST(OptionsTest, UsageListsDump) {
    EXPECT_NE(UsageText().find("\n  dump [--json]  "), std::string::npos) << UsageText();
}

TEST(OptionsTest, UsageListsRing) {
    EXPECT_NE(UsageText().find("\n  ring als|range [--period MS] [--seconds S] [--json]\n"),
              std::string::npos)
        << UsageText();
}

TEST(EventFormatTest, FloatsReadBackExactly) {
    EXPECT_EQ(FormatFloat(0.1f), "0.1");
    EXPECT_EQ(FormatFloat(4294967295.0f), "4.2949673e+09");
    EXPECT_EQ(FormatFloat(-5), "-5");
    EXPECT_EQ(strtof(FormatFloat(1.0f / 3).c_str(), nullptr), 1.0f / 3);
}

Event RangeEvent(int zones) {
    Event event{};
    event.data = {100, 1, 2, 3, 4, 5, -6, 7, static_cast<float>(zones), 99};
    for (int z = 0; z < zones; ++z) {
        std::vector<float> zone = {static_cast<float>(z), 1000.0f + z, 3, 4, 5, 6, 7, 8, 9, 10, 11};
        event.data.insert(event.data.end(), zone.begin(), zone.end());
    }
    return event;
}

TEST(EventFormatTest, DecodesRangeZones) {
    RangeFrame frame = DecodeRange(RangeEvent(2));
    EXPECT_TRUE(frame.complete);
    EXPECT_EQ(frame.reported_zones, 2);
    ASSERT_EQ(frame.zones.size(), 2u);
    EXPECT_EQ(frame.zones[1].target_status, 1);
    EXPECT_EQ(frame.zones[1].distance_mm, 1001.0f);
    EXPECT_EQ(frame.frame_number, 99.0f);
}

TEST(EventFormatTest, ShortRangeDataIsMarkedIncomplete) {
    Event event = RangeEvent(2);
    event.data.resize(25);
    RangeFrame frame = DecodeRange(event);
    EXPECT_FALSE(frame.complete);
    EXPECT_EQ(frame.zones.size(), 1u);
    EXPECT_NE(FormatEventReadable(kModeRange, event).find("incomplete"), std::string::npos);
    Event empty{};
    EXPECT_FALSE(DecodeRange(empty).complete);
}

TEST(EventFormatTest, AlsJsonNamesTheValues) {
    Event event{};
    event.status = 1;
    event.timestamp = 7;
    event.value0 = 4500;
    event.value1 = 120.5f;
    event.data = {1, 2, 3, 5, 4};
    event.boottime = 1000;
    EXPECT_EQ(FormatEventJson(kModeAls, 9, event, 1250),
              "{\"format\":1,\"sensor\":\"als\",\"handle\":9,\"status\":1,\"timestamp\":7,"
              "\"value0\":4500,"
              "\"value1\":120.5,\"data\":[1,2,3,5,4],\"lux\":120.5,\"color_temperature\":4500,"
              "\"channels\":[1,2,3,5,4],\"boottime_ns\":1000,\"received_boottime_ns\":1250}");
}

TEST(EventFormatTest, RingLineAddsTheSeqAndTheAgeAtRead) {
    Event event = RangeEvent(1);
    event.timestamp = 40;
    event.boottime = 5000000;
    EXPECT_EQ(FormatRingSampleReadable(kModeRange, 17, event, 7250000),
              FormatEventReadable(kModeRange, event) + " seq=17 age=2.250 ms");
}

DemoState StateWithThreeZones() {
    DemoState state;
    state.elapsed_s = 7.5;
    state.total_s = 15;
    state.torch_on = true;
    RangeFrame frame;
    frame.reported_zones = 3;
    frame.frame_number = 12;
    frame.zones = {{0, 1200}, {5, 1350}, {4, 980}};
    state.range = frame;
    state.range_events = 3;
    state.als_problem = "not available: open -> -19 (sensor unavailable)";
    return state;
}

TEST(DemoScreenTest, PlainLineShowsZonesRowByRow) {
    EXPECT_EQ(DemoScreen::PlainLine(StateWithThreeZones()),
              "[  7.5 s] range mm:  1200 mm [0]  1350 mm [5] /   980 mm [4] -- | light: not "
              "available: open -> -19 (sensor unavailable) | torch ON");
}

TEST(DemoScreenTest, PanelPutsTheSensorsSideBySide) {
    std::vector<std::string> panel = DemoScreen::Panel(StateWithThreeZones());
    ASSERT_GE(panel.size(), 8u);
    EXPECT_EQ(panel[0], "vyrservice live view     7.5 s of 15 s   torch ON");
    EXPECT_EQ(panel[2].find("RANGE"), 0u);
    EXPECT_NE(panel[2].find("LIGHT"), std::string::npos);
    EXPECT_NE(panel[4].find("not available"), std::string::npos);
    EXPECT_NE(panel[5].find(" 1200 mm [0] "), std::string::npos);
    EXPECT_GT(panel[5].find(" 1350 mm [5] "), panel[5].find(" 1200 mm [0] "));
    EXPECT_NE(panel[7].find(" 980 mm [4] "), std::string::npos);
    EXPECT_NE(panel[7].find("--"), std::string::npos);
}

TEST(DemoScreenTest, WaitingBeforeTheFirstSample) {
    DemoState state;
    state.total_s = 15;
    state.torch_at_s = 7.5;
    EXPECT_EQ(DemoScreen::PlainLine(state),
              "[  0.0 s] range mm: (waiting) | light: (waiting) | torch off (turns on at 7.5 s)");
}

TEST_F(ShellTest, PrintsOneResultLinePerCommand) {
    std::vector<std::string> lines =
        RunLines({"open 3", "enable 42 100", "poll 42", "poll 7", "lowpower 42 1", "disable 42",
                  "torch 257", "close 42"});
    EXPECT_EQ(lines, (std::vector<std::string>{
                         "open 3 -> 42", "enable 42 100 -> 0",
                         "poll 42 -> 0 status=171 timestamp=123 value0=0.5 value1=-2 data=[1,2.25]",
                         "poll 7 -> -61 (no new sample)",
                         "lowpower 42 1 -> -22 (invalid argument or handle)", "disable 42 -> ok",
                         "torch 257 -> ok", "close 42 -> ok"}));
    EXPECT_TRUE(err_lines_.empty());
}

TEST_F(ShellTest, BadInputGivesAnErrorLineAndGoesOn) {
    std::vector<std::string> lines =
        RunLines({"frobnicate", "enable 42", "enable x 100", "open sonar", "lowpower 42 2", "",
                  "# comment", "open 2", "quit", "open 3"});
    EXPECT_EQ(lines, (std::vector<std::string>{
                         "error: unknown command 'frobnicate' (type 'help' for the list)",
                         "error: wrong number of arguments; usage: enable HANDLE PERIOD_MS",
                         "error: 'x' is not a 32-bit whole number; usage: enable HANDLE PERIOD_MS",
                         "error: 'sonar' is not a mode (1 or als, 3 or range)",
                         "error: lowpower takes 0 or 1, not 2",
                         "open 2 -> -22 (invalid argument or handle)"}));
    EXPECT_EQ(service_->calls, std::vector<std::string>{"Open 2"});
}

TEST_F(ShellTest, CallbackEventsArePrintedAsEventLines) {
    std::vector<std::string> lines = RunLines({"callback 42"});
    EXPECT_EQ(lines, (std::vector<std::string>{
                         "event 42 status=0 timestamp=5 value0=0 value1=0 data=[1.5]",
                         "callback 42 -> 0"}));
}

TEST_F(ShellTest, ConfigurePassesTheValuesOn) {
    std::vector<std::string> lines =
        RunLines({"configure 42 1 2 3 4 1 0 2 5 6 7 8", "configure 42 1 2"});
    EXPECT_EQ(lines,
              (std::vector<std::string>{"configure 42 1 2 3 4 1 0 2 5 6 7 8 -> 0",
                                        "configure 42 1 2 -> -22 (invalid argument or handle)"}));
}

TEST_F(ShellTest, HandlesLeftOpenAreDisabledAndClosed) {
    RunLines({"open 3", "enable 42 50"});
    EXPECT_EQ(service_->calls,
              (std::vector<std::string>{"Open 3", "Enable 42 50", "Disable 42", "Close 42"}));
    ASSERT_EQ(err_lines_.size(), 1u);
    EXPECT_EQ(err_lines_[0], "releasing handle 42 left open");
}

}  // namespace
}  // namespace vyr_test::vyrctl
