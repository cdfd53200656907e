// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Reads lines from a descriptor so that a stop signal ends a blocked read (std::getline would
// retry it), and a last line without a newline still counts.

#include <optional>
#include <string>

namespace vyrctl {

class LineReader {
  public:
    explicit LineReader(int fd) : fd_(fd) {}

    // The next line without its newline; empty optional at end of input, on error, or once a
    // stop was requested.
    std::optional<std::string> Next();

  private:
    int fd_;
    std::string pending_;
    bool at_end_ = false;
};

}  // namespace vyrctl
