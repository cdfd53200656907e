// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// tools/plot-recording on the shipped scene: a PNG of the expected size; a bad file is refused
// with its line.

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <chrono>
#include <cstdint>
#include <fstream>
#include <optional>
#include <string>
#include <vector>

#include "child_process.h"
#include "temp_dir.h"
#include "test_files.h"

namespace vyr_test::vyrctl {
namespace {

constexpr std::chrono::milliseconds kWait{60000};
const std::string kTool = std::string(VYR_SOURCE_DIR) + "/tools/plot-recording";
const std::string kScene = std::string(VYR_SOURCE_DIR) + "/scenes/walk-and-torch";

struct PlotRun {
    int exit_status = -1;
    std::string errors;
};

class PlotRecordingTest : public ::testing::Test {
  protected:
    PlotRun Plot(const std::vector<std::string>& args) {
        std::vector<std::string> argv = {kTool};
        argv.insert(argv.end(), args.begin(), args.end());
        PlotRun run;
        {
            vyr_test::ChildProcess child(argv, {}, dir_.Path("stderr"));
            EXPECT_TRUE(child.started());
            const std::optional<int> status = child.Wait(kWait);
            EXPECT_TRUE(status) << "plot-recording did not end";
            if (status && WIFEXITED(*status)) run.exit_status = WEXITSTATUS(*status);
        }
        run.errors = vyr_test::ReadFile(dir_.Path("stderr"));
        return run;
    }

    TempDir dir_;
};

// Width and height from a PNG's IHDR chunk; nothing for a file that is not a PNG.
std::optional<std::pair<uint32_t, uint32_t>> PngSize(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    unsigned char header[24] = {};
    if (!file.read(reinterpret_cast<char*>(header), sizeof(header))) return std::nullopt;
    const unsigned char signature[8] = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1a, '\n'};
    if (!std::equal(signature, signature + 8, header) ||
        std::string(reinterpret_cast<char*>(header + 12), 4) != "IHDR") {
        return std::nullopt;
    }
    const auto big_endian = [&header](int at) {
        return (uint32_t{header[at]} << 24) | (uint32_t{header[at + 1]} << 16) |
               (uint32_t{header[at + 2]} << 8) | uint32_t{header[at + 3]};
    };
    return std::make_pair(big_endian(16), big_endian(20));
}

TEST_F(PlotRecordingTest, TheShippedSceneBecomesAPngWithAPanelPerSensor) {
    const std::string out = dir_.Path("scene.png");
    const PlotRun run = Plot({kScene + "/range.jsonl", kScene + "/als.jsonl", "-o", out});
    ASSERT_EQ(run.exit_status, 0) << run.errors;
    const auto size = PngSize(out);
    ASSERT_TRUE(size) << out << " is not a PNG";
    // 10 x 3.5 inches a panel at 100 dots an inch.
    EXPECT_EQ(size->first, 1000u);
    EXPECT_EQ(size->second, 700u);
}

TEST_F(PlotRecordingTest, OneSensorGivesOnePanelAndGapsAreAccepted) {
    const std::string recording = dir_.Write(
        "light.jsonl",
        "{\"sensor\":\"als\",\"timestamp\":0,\"value0\":4000,\"value1\":300,\"data\":[1,2,3,5,4]}\n"
        "{\"sensor\":\"als\",\"timestamp\":100000000,\"valid\":false}\n"
        "{\"sensor\":\"als\",\"timestamp\":200000000,\"value0\":4000,\"value1\":310,"
        "\"data\":[1,2,3,5,4]}\n"
        "{\"sensor\":\"als\",\"timestamp\":900000000,\"value0\":4100,\"value1\":320,"
        "\"data\":[1,2,3,5,4]}\n");
    const std::string out = dir_.Path("light.png");
    const PlotRun run = Plot({recording, "-o", out});
    ASSERT_EQ(run.exit_status, 0) << run.errors;
    const auto size = PngSize(out);
    ASSERT_TRUE(size);
    EXPECT_EQ(size->second, 350u);
}

TEST_F(PlotRecordingTest, ABadLineIsRefusedWithItsFileAndLine) {
    const std::string recording =
        dir_.Write("bad.jsonl", "{\"sensor\":\"als\",\"timestamp\":0}\nnot json\n");
    const PlotRun run = Plot({recording, "-o", dir_.Path("bad.png")});
    EXPECT_EQ(run.exit_status, 1);
    EXPECT_NE(run.errors.find(recording + ":2: not a record of vyrctl stream --json"),
              std::string::npos)
        << run.errors;
}

}  // namespace
}  // namespace vyr_test::vyrctl
