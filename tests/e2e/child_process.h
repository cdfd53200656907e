#pragma once

#include <sys/types.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace vyr_e2e {

// A process started with a pipe on its stdin and one on its stdout, and its stderr in a file.
class ChildProcess {
  public:
    // `env` entries ("NAME=value") are added to this process's environment for the child.
    ChildProcess(const std::vector<std::string>& argv, const std::vector<std::string>& env,
                 const std::string& stderr_path);
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    bool started() const { return pid_ > 0; }
    pid_t pid() const { return pid_; }

    bool WriteLine(const std::string& line);
    // The next line of its stdout, without the newline; nothing on time-out or end of output.
    std::optional<std::string> ReadLine(std::chrono::milliseconds timeout);
    void CloseStdin();
    void Signal(int signal);
    // The wait status once it has ended; nothing on time-out.
    std::optional<int> Wait(std::chrono::milliseconds timeout);

  private:
    pid_t pid_ = -1;
    int stdin_fd_ = -1;
    int stdout_fd_ = -1;
    std::string buffered_;
    std::optional<int> status_;
};

}  // namespace vyr_e2e
