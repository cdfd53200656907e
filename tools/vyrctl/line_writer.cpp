// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "line_writer.h"

namespace vyrctl {

void LineWriter::WriteLine(const std::string& line) {
    std::lock_guard<std::mutex> lock(mutex_);
    fputs(line.c_str(), stream_);
    fputc('\n', stream_);
    fflush(stream_);
}

void LineWriter::Write(const std::string& text) {
    std::lock_guard<std::mutex> lock(mutex_);
    fputs(text.c_str(), stream_);
    fflush(stream_);
}

}  // namespace vyrctl
