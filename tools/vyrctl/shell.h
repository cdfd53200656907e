// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// `vyrctl shell`: one IVYRService call per input line, one result line per command.

#include <aidl/android/vyr/IVYRService.h>
#include <vyr/event_sink.h>

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "line_writer.h"

namespace vyrctl {

class Shell {
  public:
    Shell(std::shared_ptr<aidl::android::vyr::IVYRService> service, LineWriter* out,
          LineWriter* err);

    // Runs one input line; false when it asks to leave.
    bool Execute(const std::string& line);
    // Reads commands from `fd` until end of input, `quit` or a stop signal (a prompt only when
    // `fd` is a terminal), then disables and closes what this session left open.
    int Run(int fd);
    // Disables and closes every handle this session opened and did not close.
    void ReleaseLeftovers();

  private:
    struct OpenClient {
        int32_t mode;
        bool enabled;
    };
    using Args = std::vector<std::string>;

    void Open(const Args& args);
    void Close(const Args& args);
    void Enable(const Args& args);
    void Disable(const Args& args);
    void LowPower(const Args& args);
    void Poll(const Args& args);
    void Callback(const Args& args);
    void Configure(const Args& args);
    void Torch(const Args& args);
    void Help();

    // Checks the argument count and parses every argument as a number; prints the error line
    // and returns false on bad input.
    bool ParseNumbers(const Args& args, size_t min_count, size_t max_count, const char* usage,
                      std::vector<int32_t>* numbers);
    void Error(const std::string& message);
    // Prints "<command line> -> <outcome>".
    void Result(const Args& args, const std::string& outcome);

    std::shared_ptr<aidl::android::vyr::IVYRService> service_;
    LineWriter* out_;
    LineWriter* err_;
    std::map<int32_t, OpenClient> open_clients_;
    // Registered callbacks stay alive for the session: the service may still call them.
    std::vector<std::shared_ptr<vyr::EventSink>> callbacks_;
};

}  // namespace vyrctl
