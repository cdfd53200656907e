// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Captures the process's liblog records (tag, priority, text) for assertions. Only one LogCapture
// may be alive at a time; while it is, every priority down to VERBOSE is delivered and records are
// also echoed to stderr so a failing test shows them.

#include <android/log.h>

#include <chrono>
#include <functional>
#include <string>
#include <vector>

namespace vyr_test {

struct LogRecord {
    std::string tag;
    int priority;
    std::string message;
};

class LogCapture {
  public:
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    std::vector<LogRecord> Records() const;
    void Clear();
    // Number of records equal in tag, priority and text.
    size_t Count(const std::string& tag, int priority, const std::string& message) const;
    bool Contains(const std::string& tag, int priority, const std::string& message) const;
    // Waits until Count(...) >= count; false on time-out.
    bool WaitFor(const std::string& tag, int priority, const std::string& message,
                 std::chrono::milliseconds timeout, size_t count = 1) const;
    bool WaitUntil(const std::function<bool(const std::vector<LogRecord>&)>& predicate,
                   std::chrono::milliseconds timeout) const;
};

}  // namespace vyr_test
