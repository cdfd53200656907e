// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "supervisor.h"

#include <fcntl.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "private_root.h"

namespace vyr_sandbox {
namespace {

constexpr auto kTermGrace = std::chrono::seconds(5);
// init's default restart period: a service is started again no sooner than this after its last
// start.
constexpr auto kRestartPeriod = std::chrono::seconds(5);

void Say(const std::string& line) {
    std::string text = line + "\n";
    const char* data = text.data();
    size_t left = text.size();
    while (left > 0) {
        ssize_t written = write(STDOUT_FILENO, data, left);
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return;
        data += written;
        left -= written;
    }
}

void Complain(const std::string& text) {
    fprintf(stderr, "vyr-sandbox: %s\n", text.c_str());
}

int StatusOf(int wait_status) {
    if (WIFEXITED(wait_status)) return WEXITSTATUS(wait_status);
    if (WIFSIGNALED(wait_status)) return 128 + WTERMSIG(wait_status);
    return kExitSetupFailed;
}

std::string SetPanel(const std::string& state) {
    if (sethostname(state.data(), state.size()) != 0) {
        return std::string("cannot set the panel state '") + state + "': " + strerror(errno);
    }
    return "";
}

sigset_t HandledSignals() {
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGCHLD);
    sigaddset(&set, SIGTERM);
    sigaddset(&set, SIGINT);
    sigaddset(&set, SIGHUP);
    return set;
}

}  // namespace

int Supervisor::Run() {
    if (unshare(CLONE_NEWNS | CLONE_NEWUTS) != 0) {
        int error = errno;
        Complain(std::string("creating mount and UTS namespaces needs root (CAP_SYS_ADMIN): ") +
                 strerror(error));
        return error == EPERM ? kExitNoPrivilege : kExitSetupFailed;
    }
    std::string error = PrivateRoot(options_.apex_dir).Enter();
    if (error.empty()) error = SetPanel(options_.panel);
    if (!error.empty()) {
        Complain(error);
        return kExitSetupFailed;
    }

    signal(SIGPIPE, SIG_IGN);
    sigset_t handled = HandledSignals();
    sigprocmask(SIG_BLOCK, &handled, nullptr);
    int signal_fd = signalfd(-1, &handled, SFD_CLOEXEC);
    if (signal_fd < 0) {
        Complain(std::string("signalfd: ") + strerror(errno));
        return kExitSetupFailed;
    }
    int status = 0;
    while (true) {
        const auto started = std::chrono::steady_clock::now();
        child_ = StartCommand();
        if (child_ < 0) {
            status = kExitSetupFailed;
            break;
        }
        Say("pid " + std::to_string(child_));
        if (Wait(signal_fd, std::nullopt, &status) == Wake::kStop) {
            status = Terminate(signal_fd);
            Say("exit " + std::to_string(status));
            break;
        }
        Say("exit " + std::to_string(status));
        if (!options_.restart || Wait(signal_fd, started + kRestartPeriod, &status) == Wake::kStop) {
            break;
        }
    }
    close(signal_fd);
    return status;
}

pid_t Supervisor::StartCommand() {
    std::vector<char*> argv;
    for (std::string& arg : options_.command) argv.push_back(arg.data());
    argv.push_back(nullptr);
    const pid_t parent = getpid();
    pid_t pid = fork();
    if (pid < 0) {
        Complain(std::string("fork: ") + strerror(errno));
        return -1;
    }
    if (pid > 0) return pid;

    // The command must not outlive the sandbox, even one killed with SIGKILL.
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(kExitExecFailed);
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);
    signal(SIGPIPE, SIG_DFL);
    // stdin carries the sandbox's control commands and stdout its replies: keep both to ourselves.
    int null_fd = open("/dev/null", O_RDONLY | O_CLOEXEC);
    if (null_fd >= 0) dup2(null_fd, STDIN_FILENO);
    dup2(STDERR_FILENO, STDOUT_FILENO);
    if (!options_.property_file.empty()) {
        setenv("VYR_PROPERTY_FILE", options_.property_file.c_str(), 1);
    }
    execvp(argv[0], argv.data());
    fprintf(stderr, "vyr-sandbox: cannot run %s: %s\n", argv[0], strerror(errno));
    _exit(kExitExecFailed);
}

bool Supervisor::HandleLine(const std::string& line) {
    if (line == "quit") return false;
    if (line.rfind("panel", 0) == 0 && (line.size() == 5 || line[5] == ' ')) {
        std::string error = SetPanel(line.size() > 5 ? line.substr(6) : "");
        Say(error.empty() ? "ok" : "error " + error);
        return true;
    }
    Say("error unknown command: " + line);
    return true;
}

Supervisor::Wake Supervisor::Wait(int signal_fd,
                                  std::optional<std::chrono::steady_clock::time_point> deadline,
                                  int* status) {
    while (true) {
        int timeout_ms = -1;
        if (deadline) {
            const auto left = std::chrono::ceil<std::chrono::milliseconds>(
                *deadline - std::chrono::steady_clock::now());
            if (left.count() <= 0) return Wake::kTimeout;
            timeout_ms = static_cast<int>(left.count());
        }
        pollfd fds[2] = {{signal_fd, POLLIN, 0}, {STDIN_FILENO, POLLIN, 0}};
        const int ready = poll(fds, stdin_open_ ? 2 : 1, timeout_ms);
        if (ready < 0) {
            if (errno == EINTR) continue;
            return Wake::kStop;
        }
        if (fds[0].revents & POLLIN) {
            signalfd_siginfo info;
            if (read(signal_fd, &info, sizeof(info)) == sizeof(info) && info.ssi_signo != SIGCHLD) {
                return Wake::kStop;
            }
            int wait_status;
            if (child_ > 0 && waitpid(child_, &wait_status, WNOHANG) == child_) {
                child_ = -1;
                *status = StatusOf(wait_status);
                return Wake::kCommandEnded;
            }
        }
        if (stdin_open_ && (fds[1].revents & (POLLIN | POLLHUP | POLLERR))) {
            char buffer[512];
            ssize_t got = read(STDIN_FILENO, buffer, sizeof(buffer));
            if (got < 0 && errno == EINTR) continue;
            // The controller went away: nobody is left to end the command, so end it now.
            if (got <= 0) return Wake::kStop;
            pending_.append(buffer, got);
            size_t end;
            while ((end = pending_.find('\n')) != std::string::npos) {
                std::string line = pending_.substr(0, end);
                pending_.erase(0, end + 1);
                if (!HandleLine(line)) return Wake::kStop;
            }
        }
    }
}

int Supervisor::Terminate(int signal_fd) {
    int wait_status;
    if (child_ < 0) return 0;
    if (waitpid(child_, &wait_status, WNOHANG) == child_) return StatusOf(wait_status);
    kill(child_, SIGTERM);
    const auto deadline = std::chrono::steady_clock::now() + kTermGrace;
    while (true) {
        if (waitpid(child_, &wait_status, WNOHANG) == child_) return StatusOf(wait_status);
        auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
            deadline - std::chrono::steady_clock::now());
        if (left.count() <= 0) break;
        pollfd fd = {signal_fd, POLLIN, 0};
        if (poll(&fd, 1, static_cast<int>(left.count())) > 0) {
            signalfd_siginfo info;
            (void)!read(signal_fd, &info, sizeof(info));
        }
    }
    kill(child_, SIGKILL);
    while (waitpid(child_, &wait_status, 0) < 0 && errno == EINTR) {
    }
    return StatusOf(wait_status);
}

int SetPanelOf(pid_t pid, const std::string& state) {
    const std::string ns_path = "/proc/" + std::to_string(pid) + "/ns/uts";
    int fd = open(ns_path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        Complain("cannot open " + ns_path + ": " + strerror(errno));
        return kExitSetupFailed;
    }
    int result = setns(fd, CLONE_NEWUTS);
    int error = errno;
    close(fd);
    if (result != 0) {
        Complain("cannot enter the UTS namespace of " + std::to_string(pid) + ": " +
                 strerror(error));
        return error == EPERM ? kExitNoPrivilege : kExitSetupFailed;
    }
    std::string failure = SetPanel(state);
    if (!failure.empty()) {
        Complain(failure);
        return errno == EPERM ? kExitNoPrivilege : kExitSetupFailed;
    }
    return 0;
}

}  // namespace vyr_sandbox
