// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "line_reader.h"

#include <unistd.h>

#include <cerrno>

#include "stop_signal.h"

namespace vyrctl {

std::optional<std::string> LineReader::Next() {
    while (true) {
        size_t newline = pending_.find('\n');
        if (newline != std::string::npos) {
            std::string line = pending_.substr(0, newline);
            pending_.erase(0, newline + 1);
            return line;
        }
        if (at_end_) {
            if (pending_.empty()) return std::nullopt;
            std::string line;
            line.swap(pending_);
            return line;
        }
        if (StopSignal::Requested()) return std::nullopt;
        char buffer[512];
        ssize_t n = read(fd_, buffer, sizeof(buffer));
        if (n < 0) {
            if (errno == EINTR) continue;
            at_end_ = true;
        } else if (n == 0) {
            at_end_ = true;
        } else {
            pending_.append(buffer, static_cast<size_t>(n));
        }
    }
}

}  // namespace vyrctl
