// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Whole lines to one stream from several threads: callback events arrive on binder threads
// while the main thread prints command results, and lines must never interleave.

#include <cstdio>
#include <mutex>
#include <string>

namespace vyrctl {

class LineWriter {
  public:
    explicit LineWriter(FILE* stream) : stream_(stream) {}

    // Writes `line` and a newline, then flushes so that a reading pipe sees it at once.
    void WriteLine(const std::string& line);
    // Writes text as it stands (prompts, screen redraws), flushed.
    void Write(const std::string& text);

  private:
    std::mutex mutex_;
    FILE* stream_;
};

}  // namespace vyrctl
