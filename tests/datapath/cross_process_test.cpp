// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The real service binary on the simulators, with real client processes (vyrctl): callbacks
// across processes, two clients on one sensor, and clients that die.

#include <android/binder_process.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <iterator>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <set>
#include <thread>
#include <vector>

#include "child_process.h"
#include "recording_callback.h"
#include "service_dump.h"
#include "service_process.h"
#include "shared_service_test.h"
#include "test_files.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr int32_t kRange = 3;
constexpr milliseconds kWait{10000};

// The number after "key": in one line of vyrctl's JSON output.
int64_t JsonInt(const std::string& json, const std::string& key) {
    size_t at = json.find("\"" + key + "\":");
    if (at == std::string::npos) return INT64_MIN;
    return strtoll(json.c_str() + at + key.size() + 3, nullptr, 10);
}

// The number of elements of the array after "key":.
size_t JsonArrayLength(const std::string& json, const std::string& key) {
    size_t at = json.find("\"" + key + "\":[");
    if (at == std::string::npos) return 0;
    size_t begin = at + key.size() + 4;
    size_t end = json.find(']', begin);
    if (end == std::string::npos || end == begin) return 0;
    return static_cast<size_t>(std::count(json.begin() + begin, json.begin() + end, ',')) + 1;
}

// A handle as the worker's log lines print it.
std::string HexOf(const std::string& handle) {
    char text[16];
    snprintf(text, sizeof(text), "%x", static_cast<unsigned>(std::atoi(handle.c_str())));
    return text;
}

bool ExitedWith(const std::optional<int>& status, int code) {
    return status && WIFEXITED(*status) && WEXITSTATUS(*status) == code;
}

class RealServiceTest : public SharedServiceTest {
  protected:
    void SetUp() override {
        ASSERT_NO_FATAL_FAILURE(SharedServiceTest::SetUp());
        ASSERT_TRUE(process_->Running());
    }

    std::unique_ptr<ChildProcess> Vyrctl(std::vector<std::string> args) {
        args.insert(args.begin(), VYRCTL_PATH);
        auto child = std::make_unique<ChildProcess>(
            args, process_->ClientEnvironment(),
            process_->dir() + "/vyrctl-" + std::to_string(++clients_) + ".log");
        EXPECT_TRUE(child->started());
        return child;
    }

    // Sends one shell command and returns what follows its " -> ".
    std::string ShellCommand(ChildProcess* shell, const std::string& command) {
        EXPECT_TRUE(shell->WriteLine(command));
        std::optional<std::string> line = shell->ReadLineStartingWith(command + " -> ", kWait);
        EXPECT_TRUE(line) << "no answer to '" << command << "'";
        return line ? line->substr(command.size() + 4) : "";
    }

    int32_t PollResult(int32_t handle) {
        Event event{};
        int32_t result = 1;
        EXPECT_TRUE(service_->PollOnce(handle, &event, &result).isOk());
        return result;
    }

    // A vyrctl shell with a handle of the range mode open; "" when that failed.
    std::string OpenInShell(ChildProcess* shell) {
        std::string handle = ShellCommand(shell, "open 3");
        EXPECT_GT(std::atoi(handle.c_str()), 0) << handle;
        return handle;
    }

    static void KillClient(ChildProcess* client) {
        client->Signal(SIGKILL);
        EXPECT_TRUE(client->Wait(kWait));
    }

    static std::string DiedLine(const std::string& handle) {
        return "client " + handle + " mode 3 died; disable sensor and remove client handle";
    }

    bool WaitForUnknownHandle(int32_t handle) {
        auto deadline = steady_clock::now() + kWait;
        while (PollResult(handle) != -22) {
            if (steady_clock::now() >= deadline) return false;
            std::this_thread::sleep_for(milliseconds(50));
        }
        return true;
    }

    int clients_ = 0;
};

TEST_F(RealServiceTest, CallbackClientReceivesEventsAtItsPeriod) {
    auto stream = Vyrctl({"--timeout", "10", "stream", "range", "--callback", "--period", "100",
                          "--count", "5", "--json"});
    std::vector<std::string> lines;
    std::vector<steady_clock::time_point> arrivals;
    while (std::optional<std::string> line = stream->ReadLine(kWait)) {
        lines.push_back(*line);
        arrivals.push_back(steady_clock::now());
    }
    EXPECT_TRUE(ExitedWith(stream->Wait(kWait), 0));
    ASSERT_EQ(lines.size(), 5u);

    // A sample is known by its time stamp and frame number. The first one may be the sample
    // that an earlier client left stored, so they need not increase.
    std::set<std::pair<int64_t, int64_t>> samples;
    for (const std::string& line : lines) {
        EXPECT_NE(line.find("\"sensor\":\"range\""), std::string::npos) << line;
        EXPECT_TRUE(samples.emplace(JsonInt(line, "timestamp"), JsonInt(line, "frame_number")).second)
            << "a sample was delivered twice: " << line;
        int64_t zones = JsonInt(line, "zone_count");
        EXPECT_EQ(JsonArrayLength(line, "data"), static_cast<size_t>(10 + 11 * zones)) << line;
    }
    // Deliveries are at least a period apart (4 gaps of 100 ms, less scheduling slack).
    EXPECT_GE(arrivals.back() - arrivals.front(), milliseconds(300));
    EXPECT_LT(arrivals.back() - arrivals.front(), milliseconds(5000));
    // The stream disabled its handle on the way out.
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
}

// The stream's lines with the reading's boot time and the boot time at which OnEvent ran.
std::vector<std::string> StreamLines(ChildProcess* stream) {
    std::vector<std::string> lines;
    while (std::optional<std::string> line = stream->ReadLine(kWait)) lines.push_back(*line);
    return lines;
}

TEST_F(RealServiceTest, CallbackStreamIsEnabledOnSampleAndStampsEachEvent) {
    auto stream = Vyrctl({"--timeout", "10", "stream", "range", "--callback", "--period", "33",
                          "--count", "6", "--json"});
    const std::vector<std::string> lines = StreamLines(stream.get());
    EXPECT_TRUE(ExitedWith(stream->Wait(kWait), 0));
    ASSERT_EQ(lines.size(), 6u);
    const int32_t handle = static_cast<int32_t>(JsonInt(lines[0], "handle"));
    EXPECT_EQ(process_->LogCount("EnableOnSample handle " + std::to_string(handle) +
                                 ", mode 3, max report latency 0"),
              1u);
    int64_t previous_frame = INT64_MIN;
    for (const std::string& line : lines) {
        const int64_t read = JsonInt(line, "boottime_ns");
        const int64_t received = JsonInt(line, "received_boottime_ns");
        EXPECT_GT(read, 0) << line;
        EXPECT_GE(received, read) << "received before it was read: " << line;
        const int64_t frame = JsonInt(line, "frame_number");
        EXPECT_GT(frame, previous_frame) << "a sample delivered twice: " << line;
        previous_frame = frame;
    }
}

TEST_F(RealServiceTest, InterfaceOneStreamIsEnabledTheVersion1Way) {
    auto stream = Vyrctl({"--timeout", "10", "stream", "range", "--callback", "--period", "50",
                          "--count", "2", "--json", "--interface", "1"});
    const std::vector<std::string> lines = StreamLines(stream.get());
    EXPECT_TRUE(ExitedWith(stream->Wait(kWait), 0));
    ASSERT_EQ(lines.size(), 2u);
    const std::string handle = std::to_string(JsonInt(lines[0], "handle"));
    EXPECT_EQ(process_->LogCount("Enable handle " + handle + ", mode 3"), 1u);
    EXPECT_EQ(process_->LogCount("EnableOnSample handle " + handle), 0u);
    EXPECT_GT(JsonInt(lines[0], "boottime_ns"), 0) << "the service stamps every event";
}

TEST_F(RealServiceTest, InterruptedStreamDisablesAndClosesItsHandle) {
    auto stream = Vyrctl({"stream", "range", "--poll", "--period", "100", "--json"});
    std::optional<std::string> first = stream->ReadLine(kWait);
    ASSERT_TRUE(first);
    int32_t handle = static_cast<int32_t>(JsonInt(*first, "handle"));
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "1", kWait));
    stream->Signal(SIGINT);
    EXPECT_TRUE(ExitedWith(stream->Wait(kWait), 0));
    EXPECT_EQ(PollResult(handle), -22) << "the stream left its handle open";
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
}

// vyrctl ring: the samples that the service writes into the shared ring, read in order from the
// ring's descriptor, as stream --json lines; the handle released on Ctrl-C.
TEST_F(RealServiceTest, RingPrintsEachSampleInOrderAndReleasesItsHandle) {
    auto ring = Vyrctl({"--timeout", "10", "ring", "range", "--period", "33", "--json"});
    const std::string errors = process_->dir() + "/vyrctl-" + std::to_string(clients_) + ".log";
    std::vector<std::string> lines;
    while (lines.size() < 6) {
        std::optional<std::string> line = ring->ReadLine(kWait);
        ASSERT_TRUE(line) << ReadFile(errors);
        lines.push_back(*line);
    }
    const int32_t handle = static_cast<int32_t>(JsonInt(lines[0], "handle"));
    EXPECT_EQ(process_->LogCount("EnableRing handle " + std::to_string(handle) + ", mode 3"), 1u);
    int64_t previous_frame = INT64_MIN;
    for (const std::string& line : lines) {
        const int64_t read = JsonInt(line, "boottime_ns");
        EXPECT_GT(read, 0) << line;
        EXPECT_GE(JsonInt(line, "received_boottime_ns"), read)
            << "read before it was written: " << line;
        EXPECT_EQ(JsonArrayLength(line, "data"), 10u + 11u * JsonInt(line, "zone_count")) << line;
        const int64_t frame = JsonInt(line, "frame_number");
        EXPECT_GT(frame, previous_frame) << "a sample read twice: " << line;
        previous_frame = frame;
    }
    ring->Signal(SIGINT);
    EXPECT_TRUE(ExitedWith(ring->Wait(kWait), 0));
    EXPECT_EQ(PollResult(handle), -22) << "the ring left its handle open";
    const std::string log = ReadFile(errors);
    EXPECT_NE(log.find("handle " + std::to_string(handle) + " disabled and closed"), std::string::npos)
        << log;
    EXPECT_EQ(log.find("gap:"), std::string::npos) << log;
}

// The readable lines carry each sample's seq: consecutive, as nothing was overwritten unread.
TEST_F(RealServiceTest, RingEndsAfterItsSecondsHavingReadEverySample) {
    auto ring = Vyrctl({"--timeout", "10", "ring", "range", "--period", "50", "--seconds", "1"});
    const std::vector<std::string> lines = StreamLines(ring.get());
    EXPECT_TRUE(ExitedWith(ring->Wait(kWait), 0));
    ASSERT_GE(lines.size(), 5u);
    uint64_t previous = 0;
    for (const std::string& line : lines) {
        unsigned long long seq = 0;
        double age_ms = -1;
        const size_t at = line.rfind(" seq=");
        ASSERT_NE(at, std::string::npos) << line;
        ASSERT_EQ(sscanf(line.c_str() + at, " seq=%llu age=%lf ms", &seq, &age_ms), 2) << line;
        EXPECT_GE(age_ms, 0) << line;
        if (previous != 0) {
            EXPECT_EQ(seq, previous + 1) << line;
        }
        previous = seq;
    }
}

TEST_F(RealServiceTest, RangeStreamGoesOnWhenLowPowerIsRefused) {
    auto stream =
        Vyrctl({"stream", "range", "--low-power", "--period", "50", "--count", "2", "--json"});
    std::optional<std::string> line = stream->ReadLine(kWait);
    ASSERT_TRUE(line);
    EXPECT_NE(line->find("\"sensor\":\"range\""), std::string::npos) << *line;
    EXPECT_TRUE(stream->ReadLine(kWait));
    EXPECT_TRUE(ExitedWith(stream->Wait(kWait), 0));
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
}

TEST_F(RealServiceTest, TwoClientsEachTakeEverySampleOnce) {
    int32_t first = 0;
    int32_t second = 0;
    ASSERT_TRUE(service_->Open(kRange, &first).isOk());
    ASSERT_TRUE(service_->Open(kRange, &second).isOk());
    ASSERT_GT(first, 0);
    ASSERT_GT(second, 0);
    int32_t result = 1;
    ASSERT_TRUE(service_->Enable(first, 50, &result).isOk());
    ASSERT_EQ(result, 0);

    // A sample is known by its time stamp and frame number (the last header value).
    std::map<int32_t, std::vector<std::pair<int64_t, int64_t>>> taken;
    auto end = steady_clock::now() + milliseconds(1500);
    while (steady_clock::now() < end) {
        for (int32_t handle : {first, second}) {
            Event event{};
            ASSERT_TRUE(service_->PollOnce(handle, &event, &result).isOk());
            if (result == 0) {
                taken[handle].emplace_back(event.timestamp, static_cast<int64_t>(event.data.at(9)));
            } else {
                EXPECT_EQ(result, -61);
            }
        }
        std::this_thread::sleep_for(milliseconds(10));
    }
    service_->Disable(first);
    service_->Close(first);
    service_->Close(second);

    std::set<std::pair<int64_t, int64_t>> seen[2];
    int index = 0;
    for (int32_t handle : {first, second}) {
        const auto& samples = taken[handle];
        EXPECT_GE(samples.size(), 3u) << "handle " << handle;
        for (const auto& sample : samples) {
            EXPECT_TRUE(seen[index].insert(sample).second)
                << "handle " << handle << " took the sample at " << sample.first << " ms (frame "
                << sample.second << ") twice";
        }
        ++index;
    }
    std::set<std::pair<int64_t, int64_t>> common;
    std::set_intersection(seen[0].begin(), seen[0].end(), seen[1].begin(), seen[1].end(),
                          std::inserter(common, common.begin()));
    EXPECT_FALSE(common.empty()) << "the two handles never took the same sample";
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
}

TEST_F(RealServiceTest, KilledClientIsDisabledAndClosed) {
    auto shell = Vyrctl({"shell"});
    std::string opened = ShellCommand(shell.get(), "open 3");
    int32_t handle = std::atoi(opened.c_str());
    ASSERT_GT(handle, 0) << opened;
    std::string h = std::to_string(handle);
    ASSERT_EQ(ShellCommand(shell.get(), "callback " + h), "0");
    ASSERT_EQ(ShellCommand(shell.get(), "enable " + h + " 100"), "0");
    ASSERT_TRUE(shell->ReadLineStartingWith("event " + h + " ", kWait))
        << "no event reached the shell's callback";
    ASSERT_TRUE(process_->WaitForSensorState("range.enabled", "1", kWait));

    shell->Signal(SIGKILL);
    ASSERT_TRUE(shell->Wait(kWait));

    EXPECT_TRUE(process_->WaitForLog(
        "client " + h + " mode 3 died; disable sensor and remove client handle", kWait))
        << process_->Log();
    EXPECT_TRUE(WaitForUnknownHandle(handle)) << "the dead client's handle is still open";
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
}

TEST_F(RealServiceTest, DeathOfAClosedClientChangesNothing) {
    int32_t survivor = 0;
    int32_t result = 1;
    ASSERT_TRUE(service_->Open(kRange, &survivor).isOk());
    ASSERT_GT(survivor, 0);
    ASSERT_TRUE(service_->Enable(survivor, 50, &result).isOk());
    ASSERT_EQ(result, 0);

    // A client that set a callback, then disabled and closed its handle.
    auto closed = Vyrctl({"shell"});
    std::string c = ShellCommand(closed.get(), "open 3");
    ASSERT_GT(std::atoi(c.c_str()), 0) << c;
    ASSERT_EQ(ShellCommand(closed.get(), "callback " + c), "0");
    ASSERT_EQ(ShellCommand(closed.get(), "enable " + c + " 100"), "0");
    ASSERT_TRUE(closed->ReadLineStartingWith("event " + c + " ", kWait));
    ASSERT_EQ(ShellCommand(closed.get(), "disable " + c), "ok");
    ASSERT_EQ(ShellCommand(closed.get(), "close " + c), "ok");

    // A live client whose death, handled after the first one's, marks the end of the notices.
    auto live = Vyrctl({"shell"});
    std::string l = ShellCommand(live.get(), "open 3");
    ASSERT_GT(std::atoi(l.c_str()), 0) << l;
    ASSERT_EQ(ShellCommand(live.get(), "callback " + l), "0");

    closed->Signal(SIGKILL);
    ASSERT_TRUE(closed->Wait(kWait));
    live->Signal(SIGKILL);
    ASSERT_TRUE(live->Wait(kWait));
    ASSERT_TRUE(process_->WaitForLog(
        "client " + l + " mode 3 died; disable sensor and remove client handle", kWait))
        << process_->Log();
    EXPECT_EQ(process_->Log().find("client " + c + " mode 3 died"), std::string::npos);

    // The other client goes on sampling, and new clients are served.
    bool fresh_sample = false;
    auto deadline = steady_clock::now() + kWait;
    while (!fresh_sample && steady_clock::now() < deadline) {
        fresh_sample = PollResult(survivor) == 0;
        if (!fresh_sample) std::this_thread::sleep_for(milliseconds(20));
    }
    EXPECT_TRUE(fresh_sample);
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "1", kWait));
    int32_t newcomer = 0;
    ASSERT_TRUE(service_->Open(kRange, &newcomer).isOk());
    EXPECT_GT(newcomer, 0);
    service_->Close(newcomer);
    service_->Disable(survivor);
    service_->Close(survivor);
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
}

TEST_F(RealServiceTest, DumpShowsTwoClientsAndTheDeathOfOne) {
    auto first = Vyrctl({"shell"});
    auto second = Vyrctl({"shell"});
    const std::string a = OpenInShell(first.get());
    const std::string b = OpenInShell(second.get());
    ASSERT_EQ(ShellCommand(first.get(), "enable " + a + " 300"), "0");
    ASSERT_EQ(ShellCommand(second.get(), "enable " + b + " 120"), "0");
    ASSERT_TRUE(
        process_->WaitForLog("handle:" + HexOf(b) + " sampling/active period 120/120", kWait));

    // As a person would ask for it: vyrctl dump --json, whose output must parse.
    auto dumper = Vyrctl({"dump", "--json"});
    std::string output;
    while (std::optional<std::string> line = dumper->ReadLine(kWait)) output += *line + "\n";
    ASSERT_TRUE(ExitedWith(dumper->Wait(kWait), 0));
    const nlohmann::json dump = nlohmann::json::parse(output);
    const nlohmann::json& block = dump["modes"][2];
    EXPECT_EQ(block["active_period_ms"], 120);
    EXPECT_EQ(block["periods_ms"][a], 300);
    EXPECT_EQ(block["periods_ms"][b], 120);
    std::map<std::string, nlohmann::json> clients;
    for (const auto& client : dump["clients"]) clients[client["handle"].dump()] = client;
    ASSERT_EQ(clients.count(a), 1u) << output;
    EXPECT_EQ(clients[a]["pid"], first->pid());
    EXPECT_EQ(clients[b]["period_ms"], 120);

    KillClient(second.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(b), kWait));
    const vyr_test::DumpResult after = vyr_test::DumpOf(service_->asBinder().get());
    ASSERT_EQ(after.status, STATUS_OK);
    EXPECT_NE(after.text.find("event: death of handle " + b + " (process " +
                              std::to_string(second->pid()) + ")\n"),
              std::string::npos)
        << after.text;
    EXPECT_EQ(after.text.find("handle: " + b + "\n"), std::string::npos) << "still listed";
    EXPECT_NE(after.text.find("handle: " + a + "\n"), std::string::npos);
    ASSERT_EQ(ShellCommand(first.get(), "disable " + a), "ok");
    ShellCommand(first.get(), "close " + a);
}

TEST_F(RealServiceTest, KilledPollOnlyClientIsDisabledAndClosed) {
    auto shell = Vyrctl({"shell"});
    const std::string h = OpenInShell(shell.get());
    ASSERT_EQ(ShellCommand(shell.get(), "enable " + h + " 100"), "0");
    ASSERT_TRUE(process_->WaitForSensorState("range.enabled", "1", kWait));
    const size_t notices = process_->LogCount("Receive binder death callback");

    KillClient(shell.get());
    EXPECT_TRUE(process_->WaitForLog(DiedLine(h), kWait)) << process_->Log();
    EXPECT_GT(process_->LogCount("Receive binder death callback"), notices);
    EXPECT_TRUE(WaitForUnknownHandle(std::atoi(h.c_str())));
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait))
        << "a client without a callback left the sensor running";
}

TEST_F(RealServiceTest, ClientKilledBeforeSetCallbackIsClosed) {
    auto shell = Vyrctl({"shell"});
    const std::string h = OpenInShell(shell.get());
    KillClient(shell.get());
    EXPECT_TRUE(process_->WaitForLog(DiedLine(h), kWait)) << process_->Log();
    EXPECT_TRUE(WaitForUnknownHandle(std::atoi(h.c_str())));
}

TEST_F(RealServiceTest, TenCrashedClientsLeaveRoomForNewOnes) {
    std::vector<std::string> handles;
    for (int i = 0; i < 10; ++i) {
        auto shell = Vyrctl({"shell"});
        const std::string h = OpenInShell(shell.get());
        if (i % 2 == 0) {
            ASSERT_EQ(ShellCommand(shell.get(), "enable " + h + " 50"), "0");
        }
        handles.push_back(h);
        KillClient(shell.get());
    }
    for (const std::string& h : handles) {
        EXPECT_TRUE(WaitForUnknownHandle(std::atoi(h.c_str()))) << "handle " << h;
    }
    std::vector<int32_t> opened;
    for (int i = 0; i < 10; ++i) {
        int32_t handle = 0;
        ASSERT_TRUE(service_->Open(kRange, &handle).isOk());
        EXPECT_GT(handle, 0) << "open " << i;
        opened.push_back(handle);
    }
    for (int32_t handle : opened) service_->Close(handle);
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
}

TEST_F(RealServiceTest, ACallbackClientsDeathIsHandledOnce) {
    auto shell = Vyrctl({"shell"});
    const std::string h = OpenInShell(shell.get());
    ASSERT_EQ(ShellCommand(shell.get(), "callback " + h), "0");
    ASSERT_EQ(ShellCommand(shell.get(), "enable " + h + " 100"), "0");
    ASSERT_TRUE(shell->ReadLineStartingWith("event " + h + " ", kWait));
    KillClient(shell.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(h), kWait)) << process_->Log();
    // A later death, handled after anything left of the first one.
    auto marker = Vyrctl({"shell"});
    const std::string m = OpenInShell(marker.get());
    KillClient(marker.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(m), kWait));
    EXPECT_EQ(process_->LogCount(DiedLine(h)), 1u)
        << "the callback's death link and the process's end both handled the client";
}

TEST_F(RealServiceTest, AHandleOutlivesItsOpenerWhileAnotherProcessUsesIt) {
    auto opener = Vyrctl({"shell"});
    auto user = Vyrctl({"shell"});
    const std::string h = OpenInShell(opener.get());
    ASSERT_EQ(ShellCommand(user.get(), "enable " + h + " 50"), "0");
    ASSERT_TRUE(process_->WaitForSensorState("range.enabled", "1", kWait));
    KillClient(opener.get());
    // A later death, handled after anything the opener's end did.
    auto marker = Vyrctl({"shell"});
    const std::string m = OpenInShell(marker.get());
    KillClient(marker.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(m), kWait)) << process_->Log();

    EXPECT_EQ(process_->LogCount(DiedLine(h)), 0u) << "released while another process uses it";
    EXPECT_EQ(ShellCommand(user.get(), "enable " + h + " 50"), "-17 (already enabled)");
    const std::string polled = ShellCommand(user.get(), "poll " + h);
    EXPECT_TRUE(polled.rfind("0 ", 0) == 0 || polled.rfind("-61", 0) == 0) << polled;
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "1", kWait));

    // The last of its processes gone, the handle goes, once.
    const size_t notices = process_->LogCount("Receive binder death callback");
    KillClient(user.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(h), kWait)) << process_->Log();
    EXPECT_TRUE(WaitForUnknownHandle(std::atoi(h.c_str())));
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
    EXPECT_EQ(process_->LogCount(DiedLine(h)), 1u);
    EXPECT_EQ(process_->LogCount("Receive binder death callback"), notices + 1);
}

TEST_F(RealServiceTest, CallbackEventsGoOnWhenTheOpenerEnds) {
    auto opener = Vyrctl({"shell"});
    auto user = Vyrctl({"shell"});
    const std::string h = OpenInShell(opener.get());
    ASSERT_EQ(ShellCommand(user.get(), "callback " + h), "0");
    ASSERT_EQ(ShellCommand(user.get(), "enable " + h + " 50"), "0");
    ASSERT_TRUE(user->ReadLineStartingWith("event " + h + " ", kWait));
    KillClient(opener.get());
    auto marker = Vyrctl({"shell"});
    const std::string m = OpenInShell(marker.get());
    KillClient(marker.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(m), kWait)) << process_->Log();

    // Events still come after the opener's end has been handled.
    for (int i = 0; i < 3; ++i) {
        EXPECT_TRUE(user->ReadLineStartingWith("event " + h + " ", kWait)) << "event " << i;
    }
    EXPECT_EQ(process_->LogCount(DiedLine(h)), 0u);
    const size_t notices = process_->LogCount("Receive binder death callback");
    KillClient(user.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(h), kWait)) << process_->Log();
    EXPECT_TRUE(WaitForUnknownHandle(std::atoi(h.c_str())));
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
    // Another death marks the end of whatever notices the first one could bring.
    auto last = Vyrctl({"shell"});
    const std::string l = OpenInShell(last.get());
    KillClient(last.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(l), kWait));
    EXPECT_EQ(process_->LogCount(DiedLine(h)), 1u);
    EXPECT_EQ(process_->LogCount("Receive binder death callback"), notices + 2)
        << "one notice line for each of the two deaths";
}

TEST_F(RealServiceTest, DumpCountsTheWatchedProcesses) {
    const auto watched = [this] {
        const vyr_test::DumpResult dump = vyr_test::DumpOf(service_->asBinder().get(), {"--json"});
        EXPECT_EQ(dump.status, STATUS_OK);
        return nlohmann::json::parse(dump.text)["watched_processes"].get<int64_t>();
    };
    // Ends of earlier tests' clients are handled before this marker's.
    auto marker = Vyrctl({"shell"});
    const std::string m = OpenInShell(marker.get());
    KillClient(marker.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(m), kWait));
    const int64_t before = watched();
    auto first = Vyrctl({"shell"});
    auto second = Vyrctl({"shell"});
    const std::string a = OpenInShell(first.get());
    const std::string b = OpenInShell(second.get());
    // One process using two handles is watched once.
    const std::string a2 = OpenInShell(first.get());
    ShellCommand(second.get(), "poll " + a);
    EXPECT_EQ(watched(), before + 2);
    KillClient(second.get());
    ASSERT_TRUE(process_->WaitForLog(DiedLine(b), kWait));
    EXPECT_EQ(watched(), before + 1) << "an ended process's descriptor is kept";
    ShellCommand(first.get(), "close " + a);
    EXPECT_EQ(watched(), before + 1) << "still the user of another handle";
    ShellCommand(first.get(), "close " + a2);
    EXPECT_EQ(watched(), before);
}

TEST_F(RealServiceTest, ClientThatDisablesAndClosesFromItsCallbackLeavesTheServiceServing) {
    int32_t handle = 0;
    ASSERT_TRUE(service_->Open(kRange, &handle).isOk());
    ASSERT_GT(handle, 0);
    auto callback = ndk::SharedRefBase::make<vyr_test::RecordingCallback>();
    callback->SetReaction([handle](size_t count) {
        if (count != 1) return;
        service_->Disable(handle);
        service_->Close(handle);
    });
    int32_t result = 1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_EQ(result, 0);
    ASSERT_TRUE(service_->Enable(handle, 50, &result).isOk());
    ASSERT_EQ(result, 0);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));
    EXPECT_TRUE(WaitForUnknownHandle(handle));
    EXPECT_TRUE(process_->WaitForLog(
        "DisableInternal handle " + std::to_string(handle) + ", mode 3", kWait));
    EXPECT_TRUE(process_->WaitForSensorState("range.enabled", "0", kWait));
    EXPECT_TRUE(process_->Running());
    int32_t next = 0;
    ASSERT_TRUE(service_->Open(kRange, &next).isOk());
    EXPECT_GT(next, 0);
    service_->Close(next);
}

TEST_F(RealServiceTest, RepeatedSetCallbackAndCloseKeepsNoMemory) {
    auto callback = ndk::SharedRefBase::make<vyr_test::RecordingCallback>();
    const auto cycle = [&] {
        int32_t handle = 0;
        int32_t result = 1;
        service_->Open(kRange, &handle);
        service_->SetCallback(handle, callback, &result);
        service_->SetCallback(handle, callback, &result);
        service_->Close(handle);
        return result;
    };
    // Warm up the allocator, then compare.
    for (int i = 0; i < 2000; ++i) ASSERT_EQ(cycle(), 0) << process_->Log();
    const long before = process_->RssKib();
    for (int i = 0; i < 20000; ++i) ASSERT_EQ(cycle(), 0);
    const long after = process_->RssKib();
    ASSERT_GT(before, 0);
    // Each cycle used to keep two links of about 265 bytes: over 10 MB here. Sanitizer
    // allocators hold freed memory back on purpose, so only a plain build can tell.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
    std::cout << "service RSS " << before << " KiB before, " << after << " KiB after\n";
#else
    EXPECT_LT(after - before, 2048) << before << " KiB before, " << after << " KiB after";
#endif
}

TEST_F(RealServiceTest, ConfigureAndTorchReachTheSensors) {
    auto configure = Vyrctl({"configure", "10", "0", "0", "0", "1", "0", "0", "0", "0", "0", "0"});
    EXPECT_EQ(configure->ReadLine(kWait), "configure -> 0");
    EXPECT_TRUE(ExitedWith(configure->Wait(kWait), 0));
    EXPECT_TRUE(process_->WaitForSensorState("range.frame_rate_hz", "10", kWait));

    auto torch = Vyrctl({"torch", "257"});
    EXPECT_EQ(torch->ReadLine(kWait), "torch 257 -> ok");
    EXPECT_TRUE(ExitedWith(torch->Wait(kWait), 0));
    EXPECT_TRUE(process_->WaitForSensorState("torch", "1", kWait));
    EXPECT_TRUE(process_->WaitForLog("torch state changed to 257", kWait));

    auto restore = Vyrctl({"configure", "30", "0", "0", "0", "0", "0", "0", "0", "0", "0", "0"});
    EXPECT_TRUE(ExitedWith(restore->Wait(kWait), 0));
    auto dark = Vyrctl({"torch", "0"});
    EXPECT_TRUE(ExitedWith(dark->Wait(kWait), 0));
    EXPECT_TRUE(process_->WaitForSensorState("torch", "0", kWait));
}

TEST_F(RealServiceTest, ClientGivesUpClearlyWithoutAService) {
    std::string empty_registry = process_->dir() + "/empty-registry";
    ASSERT_EQ(mkdir(empty_registry.c_str(), 0700), 0);
    std::string stderr_path = process_->dir() + "/vyrctl-no-service.log";
    ChildProcess torch({VYRCTL_PATH, "--timeout", "0.5", "torch", "1"},
                       {{"VYR_BINDER_DIR", empty_registry}}, stderr_path);
    EXPECT_TRUE(ExitedWith(torch.Wait(kWait), 1));
    std::ifstream in(stderr_path);
    std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    EXPECT_NE(text.find("waiting for vyrservice..."), std::string::npos) << text;
    EXPECT_NE(text.find("error: service \"vyrservice\" not found after"), std::string::npos) << text;
}

}  // namespace
}  // namespace vyr_test::datapath
