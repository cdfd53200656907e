// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "child_process.h"
#include "test_files.h"

namespace vyr_test::e2e {
namespace {

using namespace std::chrono_literals;

constexpr auto kWait = 10s;
constexpr char kSetpriv[] = "/usr/bin/setpriv";

// vyr-sandbox running a shell command, with its stderr (and the command's output) in a file.
class SandboxTest : public ::testing::Test {
  protected:
    void SetUp() override {
        if (geteuid() != 0) {
            const char* ci = getenv("CI");
            if (ci != nullptr && std::string(ci) == "true") GTEST_FAIL() << "needs root";
            GTEST_SKIP() << "needs root to create namespaces";
        }
        dir_ = vyr_test::MakeTempDir("vyr-sandbox-test.");
        ASSERT_FALSE(dir_.empty());
        // Readable for the unprivileged run too.
        chmod(dir_.c_str(), 0755);
        std::ofstream(dir_ + "/apex-info-list.xml") << "<apex-info-list/>\n";
        std::ofstream(dir_ + "/build.prop") << "persist.vendor.camera.vyr_supported=true\n";
    }

    void TearDown() override {
        sandbox_.reset();
        if (dir_.empty()) return;
        unlink((dir_ + "/apex-info-list.xml").c_str());
        unlink((dir_ + "/build.prop").c_str());
        unlink((dir_ + "/output").c_str());
        rmdir(dir_.c_str());
    }

    // Starts the sandbox on `script`; true once it reported the command's pid.
    bool Start(const std::string& script, const std::vector<std::string>& prefix = {},
               const std::vector<std::string>& options = {}) {
        std::vector<std::string> argv = prefix;
        argv.push_back(VYR_SANDBOX_PATH);
        argv.push_back("run");
        argv.insert(argv.end(), options.begin(), options.end());
        for (const std::string& arg :
             {std::string("--panel"), std::string("Off"), std::string("--apex"),
              dir_ + "/apex-info-list.xml", std::string("--props"), dir_ + "/build.prop",
              std::string("--"), std::string("/bin/sh"), std::string("-c"), script}) {
            argv.push_back(arg);
        }
        sandbox_ = std::make_unique<vyr_test::ChildProcess>(
            argv, std::map<std::string, std::string>{}, dir_ + "/output", kWait);
        const auto line = sandbox_->ReadLine(kWait);
        return line && line->rfind("pid ", 0) == 0;
    }

    std::string Output() { return ReadFile(dir_ + "/output"); }

    std::string dir_;
    std::unique_ptr<vyr_test::ChildProcess> sandbox_;
};

TEST_F(SandboxTest, DevicePathsShowWhatTheCallerControls) {
    char host_name[128] = {};
    gethostname(host_name, sizeof(host_name) - 1);
    ASSERT_TRUE(
        Start("cat /sys/class/backlight/panel0-backlight/state /apex/apex-info-list.xml; "
              "echo \"props=$VYR_PROPERTY_FILE\"; read line < "
              "/sys/class/backlight/panel0-backlight/state; "
              "while [ \"$line\" != HBM ]; do sleep 0.01; "
              "read line < /sys/class/backlight/panel0-backlight/state; done; echo seen $line"));
    // The command has shown the initial state once its next line is out.
    const auto deadline = std::chrono::steady_clock::now() + kWait;
    while (Output().find("props=") == std::string::npos &&
           std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(5ms);
    }
    ASSERT_TRUE(sandbox_->WriteLine("panel HBM"));
    EXPECT_EQ("ok", sandbox_->ReadLine(kWait));
    EXPECT_EQ("exit 0", sandbox_->ReadLine(kWait));
    const auto status = sandbox_->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 0);
    EXPECT_EQ("Off\n<apex-info-list/>\nprops=" + dir_ + "/build.prop\nseen HBM\n", Output());
    // The machine's own name is untouched.
    char after[128] = {};
    gethostname(after, sizeof(after) - 1);
    EXPECT_STREQ(host_name, after);
}

TEST_F(SandboxTest, ForwardsTheExitCode) {
    ASSERT_TRUE(Start("exit 3"));
    EXPECT_EQ("exit 3", sandbox_->ReadLine(kWait));
    const auto status = sandbox_->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 3);
}

TEST_F(SandboxTest, ForwardsADeathBySignalAs128PlusTheSignal) {
    ASSERT_TRUE(Start("kill -KILL $$"));
    EXPECT_EQ("exit 137", sandbox_->ReadLine(kWait));
    const auto status = sandbox_->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 137);
}

TEST_F(SandboxTest, QuitAndEndOfInputEndTheCommand) {
    ASSERT_TRUE(Start("sleep 60"));
    ASSERT_TRUE(sandbox_->WriteLine("panel"));
    EXPECT_EQ("ok", sandbox_->ReadLine(kWait));
    ASSERT_TRUE(sandbox_->WriteLine("bogus"));
    EXPECT_EQ("error unknown command: bogus", sandbox_->ReadLine(kWait));
    ASSERT_TRUE(sandbox_->WriteLine("quit"));
    EXPECT_EQ("exit 143", sandbox_->ReadLine(kWait));

    ASSERT_TRUE(Start("sleep 60"));
    sandbox_->CloseStdin();
    EXPECT_EQ("exit 143", sandbox_->ReadLine(kWait));
}

TEST_F(SandboxTest, RestartStartsTheCommandAgainAsInitDoes) {
    // Before the first start, so that the interval measured is never shorter than the real one.
    const auto first_start = std::chrono::steady_clock::now();
    ASSERT_TRUE(Start("exit 3", {}, {"--restart"}));
    EXPECT_EQ(sandbox_->ReadLine(kWait), "exit 3");
    // init's restart period: the next start comes 5 s after the last one at the earliest.
    const auto again = sandbox_->ReadLine(kWait);
    ASSERT_TRUE(again && again->rfind("pid ", 0) == 0) << again.value_or("(nothing)");
    EXPECT_GE(std::chrono::steady_clock::now() - first_start, 5s);
    EXPECT_EQ(sandbox_->ReadLine(kWait), "exit 3");
    sandbox_->Signal(SIGTERM);
    const auto status = sandbox_->Wait(kWait);
    ASSERT_TRUE(status) << "SIGTERM did not end the restarting sandbox";
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 3);
}

TEST_F(SandboxTest, RestartEndsARunningCommandWhenAskedTo) {
    ASSERT_TRUE(Start("sleep 60", {}, {"--restart"}));
    ASSERT_TRUE(sandbox_->WriteLine("quit"));
    EXPECT_EQ(sandbox_->ReadLine(kWait), "exit 143");
    const auto status = sandbox_->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 143);
}

TEST_F(SandboxTest, ExitsWith77WithoutPrivilege) {
    if (access(kSetpriv, X_OK) != 0) GTEST_SKIP() << kSetpriv << " is needed to drop root";
    EXPECT_FALSE(Start("true", {kSetpriv, "--reuid", "65534", "--regid", "65534", "--clear-groups",
                                "--inh-caps", "-all"}));
    const auto status = sandbox_->Wait(kWait);
    ASSERT_TRUE(status);
    EXPECT_TRUE(WIFEXITED(*status) && WEXITSTATUS(*status) == 77);
    EXPECT_NE(std::string::npos, Output().find("needs root (CAP_SYS_ADMIN)"));
}

}  // namespace
}  // namespace vyr_test::e2e
