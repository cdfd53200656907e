// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sandboxed_service.h"

#include <dirent.h>
#include <fcntl.h>
#include <ftw.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <functional>
#include <thread>

#include "test_files.h"

namespace vyr_test::e2e {
namespace {

using namespace std::chrono_literals;

constexpr auto kStartTimeout = 10s;
constexpr auto kStopTimeout = 10s;

bool WaitUntil(const std::function<bool()>& condition, std::chrono::milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (!condition()) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(10ms);
    }
    return true;
}

bool WriteFile(const std::string& path, const std::string& content) {
    std::ofstream out(path, std::ios::trunc);
    out << content;
    return static_cast<bool>(out);
}

int RemoveEntry(const char* path, const struct stat*, int, FTW*) {
    return remove(path);
}

}  // namespace

SandboxedService::SandboxedService(const Options& options) {
    dir_ = vyr_test::MakeTempDir("vyr-e2e.");
    if (dir_.empty()) {
        problem_ = "cannot create a temporary directory";
        return;
    }
    mkdir((dir_ + "/binder").c_str(), 0700);
    std::string properties;
    for (const auto& [key, value] : options.properties) properties += key + "=" + value + "\n";
    WriteFile(dir_ + "/build.prop", properties);
    WriteFile(dir_ + "/apex-info-list.xml", options.apex_list);

    started_at_ = std::chrono::steady_clock::now();
    std::vector<std::string> argv = {VYR_SANDBOX_PATH, "run",
                                     "--panel",        options.panel,
                                     "--apex",         dir_ + "/apex-info-list.xml",
                                     "--props",        dir_ + "/build.prop"};
    if (options.restart) argv.push_back("--restart");
    argv.insert(argv.end(), {"--", VYRSERVICE_PATH});
    sandbox_ =
        std::make_unique<vyr_test::ChildProcess>(argv, ClientEnvironment(), dir_ + "/service.log");
    const std::optional<std::string> first = sandbox_->ReadLine(kStartTimeout);
    if (first && first->rfind("pid ", 0) == 0) {
        service_pid_ = std::stoi(first->substr(4));
        return;
    }
    const std::optional<int> status = sandbox_->Wait(kStopTimeout);
    problem_ = "vyr-sandbox did not start the service";
    if (status && WIFEXITED(*status)) {
        problem_ += " (exit status " + std::to_string(WEXITSTATUS(*status)) + ")";
    }
    std::ifstream log(dir_ + "/service.log");
    problem_ += ": " + std::string(std::istreambuf_iterator<char>(log), {});
}

SandboxedService::~SandboxedService() {
    if (sandbox_ != nullptr) {
        // End of input makes the sandbox end the service.
        sandbox_->CloseStdin();
        if (!sandbox_->Wait(kStopTimeout)) sandbox_->Signal(SIGKILL);
        sandbox_.reset();
        // Sanitized builds of the service report into its log and may go on running.
        for (const char* report : {"Sanitizer", "runtime error:"}) {
            std::ifstream log(dir_ + "/service.log");
            const std::string text{std::istreambuf_iterator<char>(log), {}};
            EXPECT_EQ(std::string::npos, text.find(report)) << text;
        }
    }
    if (!dir_.empty() && getenv("VYR_E2E_KEEP") == nullptr) {
        nftw(dir_.c_str(), RemoveEntry, 16, FTW_DEPTH | FTW_PHYS);
    }
}

std::map<std::string, std::string> SandboxedService::ClientEnvironment() const {
    return {{"VYR_BINDER_DIR", dir_ + "/binder"}, {"VYR_SENSOR_STATE_FILE", dir_ + "/sensors"}};
}

bool SandboxedService::Panel(const std::string& state) {
    if (!sandbox_->WriteLine("panel " + state)) return false;
    const std::optional<std::string> reply = sandbox_->ReadLine(kStopTimeout);
    return reply && *reply == "ok";
}

namespace {

// The descriptor of process `pid` open on the backlight state attribute, or -1.
int StateDescriptor(pid_t pid) {
    const std::string fd_dir = "/proc/" + std::to_string(pid) + "/fd";
    DIR* dir = opendir(fd_dir.c_str());
    if (dir == nullptr) return -1;
    int found = -1;
    while (dirent* entry = readdir(dir)) {
        char target[PATH_MAX];
        const std::string link = fd_dir + "/" + entry->d_name;
        const ssize_t length = readlink(link.c_str(), target, sizeof(target) - 1);
        if (length <= 0) continue;
        const std::string path(target, length);
        if (path.find("panel0-backlight/state") != std::string::npos ||
            path == "/proc/sys/kernel/hostname") {
            found = atoi(entry->d_name);
        }
    }
    closedir(dir);
    return found;
}

}  // namespace

bool SandboxedService::MonitorWatching() const {
    return StateDescriptor(service_pid_) >= 0;
}

bool SandboxedService::WaitForMonitorRead(size_t length, std::chrono::milliseconds timeout) const {
    return WaitUntil(
        [&] {
            const int fd = StateDescriptor(service_pid_);
            if (fd < 0) return false;
            std::ifstream info("/proc/" + std::to_string(service_pid_) + "/fdinfo/" +
                               std::to_string(fd));
            std::string key;
            size_t position = 0;
            return static_cast<bool>(info >> key >> position) && key == "pos:" && position == length;
        },
        timeout);
}

bool SandboxedService::WriteApexList(const std::string& content) const {
    const int fd = open((dir_ + "/apex-info-list.xml").c_str(), O_WRONLY | O_CLOEXEC);
    if (fd < 0) return false;
    const bool written =
        pwrite(fd, content.data(), content.size(), 0) == static_cast<ssize_t>(content.size());
    close(fd);
    return written;
}

std::vector<LogLine> SandboxedService::Log() const {
    return ReadServiceLog(dir_ + "/service.log");
}

bool SandboxedService::WaitForLog(const std::string& tag, char priority, const std::string& message,
                                  std::chrono::milliseconds timeout, size_t count) const {
    return WaitUntil([&] { return CountRecords(Log(), tag, priority, message) >= count; }, timeout);
}

std::map<std::string, std::string> SandboxedService::SensorState() const {
    return vyr_test::ReadKeyValues(dir_ + "/sensors");
}

bool SandboxedService::WaitForSensorState(const std::string& key, const std::string& value,
                                          std::chrono::milliseconds timeout) const {
    return WaitUntil([&] { return SensorState()[key] == value; }, timeout);
}

std::optional<int> SandboxedService::WaitForExit(std::chrono::milliseconds timeout) {
    if (exit_status_) return exit_status_;
    const std::optional<std::string> line = sandbox_->ReadLine(timeout);
    if (!line || line->rfind("exit ", 0) != 0) return std::nullopt;
    exit_status_ = std::stoi(line->substr(5));
    return exit_status_;
}

std::optional<pid_t> SandboxedService::WaitForRestart(std::chrono::milliseconds timeout) {
    const std::optional<std::string> line = sandbox_->ReadLine(timeout);
    if (!line || line->rfind("pid ", 0) != 0) return std::nullopt;
    exit_status_.reset();
    service_pid_ = std::stoi(line->substr(4));
    return service_pid_;
}

}  // namespace vyr_test::e2e
