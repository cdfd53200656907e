// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "child_process.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <thread>

extern char** environ;

namespace vyr_test {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

ChildProcess::ChildProcess(const std::vector<std::string>& argv,
                           const std::map<std::string, std::string>& env,
                           const std::string& stderr_path, milliseconds exit_grace)
    : exit_grace_(exit_grace) {
    // A child that has gone must show up as a failed write, not kill the test with SIGPIPE.
    signal(SIGPIPE, SIG_IGN);
    std::map<std::string, std::string> merged;
    for (char** e = environ; *e != nullptr; ++e) {
        const char* eq = strchr(*e, '=');
        if (eq != nullptr) merged[std::string(*e, static_cast<size_t>(eq - *e))] = eq + 1;
    }
    for (const auto& [key, value] : env) merged[key] = value;
    std::vector<std::string> env_strings;
    for (const auto& [key, value] : merged) env_strings.push_back(key + "=" + value);
    std::vector<char*> envp;
    for (auto& s : env_strings) envp.push_back(s.data());
    envp.push_back(nullptr);
    std::vector<std::string> args = argv;
    std::vector<char*> argp;
    for (auto& s : args) argp.push_back(s.data());
    argp.push_back(nullptr);

    int in[2];
    int out[2];
    if (pipe2(in, O_CLOEXEC) != 0) return;
    if (pipe2(out, O_CLOEXEC) != 0) {
        close(in[0]);
        close(in[1]);
        return;
    }
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, in[0], STDIN_FILENO);
    posix_spawn_file_actions_adddup2(&actions, out[1], STDOUT_FILENO);
    posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, stderr_path.c_str(),
                                     O_WRONLY | O_CREAT | O_APPEND, 0644);
    pid_t pid = -1;
    int rc = posix_spawn(&pid, argp[0], &actions, nullptr, argp.data(), envp.data());
    posix_spawn_file_actions_destroy(&actions);
    close(in[0]);
    close(out[1]);
    if (rc != 0) {
        close(in[1]);
        close(out[0]);
        return;
    }
    pid_ = pid;
    stdin_fd_ = in[1];
    stdout_fd_ = out[0];
}

ChildProcess::~ChildProcess() {
    CloseStdin();
    if (pid_ > 0 && !Wait(exit_grace_)) {
        Signal(SIGKILL);
        Wait(milliseconds(10000));
    }
    if (stdout_fd_ >= 0) close(stdout_fd_);
}

bool ChildProcess::WriteLine(const std::string& line) {
    if (stdin_fd_ < 0) return false;
    std::string text = line + "\n";
    return write(stdin_fd_, text.data(), text.size()) == static_cast<ssize_t>(text.size());
}

void ChildProcess::CloseStdin() {
    if (stdin_fd_ >= 0) close(stdin_fd_);
    stdin_fd_ = -1;
}

std::optional<std::string> ChildProcess::ReadLine(milliseconds timeout) {
    auto deadline = steady_clock::now() + timeout;
    while (true) {
        size_t newline = pending_.find('\n');
        if (newline != std::string::npos) {
            std::string line = pending_.substr(0, newline);
            pending_.erase(0, newline + 1);
            return line;
        }
        if (stdout_fd_ < 0) return std::nullopt;
        auto left = std::chrono::duration_cast<milliseconds>(deadline - steady_clock::now());
        if (left.count() <= 0) return std::nullopt;
        pollfd pfd = {stdout_fd_, POLLIN, 0};
        int ready = poll(&pfd, 1, static_cast<int>(left.count()));
        if (ready < 0 && errno == EINTR) continue;
        if (ready <= 0) return std::nullopt;
        char buffer[4096];
        ssize_t n = read(stdout_fd_, buffer, sizeof(buffer));
        if (n <= 0) {
            close(stdout_fd_);
            stdout_fd_ = -1;
            continue;
        }
        pending_.append(buffer, static_cast<size_t>(n));
    }
}

std::optional<std::string> ChildProcess::ReadLineStartingWith(const std::string& prefix,
                                                              milliseconds timeout,
                                                              std::vector<std::string>* skipped) {
    auto deadline = steady_clock::now() + timeout;
    while (true) {
        auto left = std::chrono::duration_cast<milliseconds>(deadline - steady_clock::now());
        if (left.count() <= 0) return std::nullopt;
        std::optional<std::string> line = ReadLine(left);
        if (!line) return std::nullopt;
        if (line->rfind(prefix, 0) == 0) return line;
        if (skipped != nullptr) skipped->push_back(*line);
    }
}

void ChildProcess::Signal(int signal) {
    if (pid_ > 0 && !status_) kill(pid_, signal);
}

std::optional<int> ChildProcess::Wait(milliseconds timeout) {
    if (status_ || pid_ <= 0) return status_;
    auto deadline = steady_clock::now() + timeout;
    while (true) {
        int status = 0;
        pid_t done = waitpid(pid_, &status, WNOHANG);
        if (done == pid_) {
            status_ = status;
            return status_;
        }
        if (done < 0 && errno != EINTR) return std::nullopt;
        if (steady_clock::now() >= deadline) return std::nullopt;
        std::this_thread::sleep_for(milliseconds(10));
    }
}

bool ChildProcess::Running() {
    return pid_ > 0 && !Wait(milliseconds(0));
}

std::unique_ptr<ChildProcess> StartSleeper(const std::string& stderr_path) {
    return std::make_unique<ChildProcess>(std::vector<std::string>{"/bin/sleep", "60"},
                                          std::map<std::string, std::string>{}, stderr_path);
}

}  // namespace vyr_test
