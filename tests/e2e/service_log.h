// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>
#include <vector>

namespace vyr_test::e2e {

// One record of the host liblog output on stderr:
// "<tag> <priority letter> <date> <time> <pid> <tid> <message>", where a message that contains
// newlines continues on the following lines.
struct LogLine {
    std::string tag;
    char priority;
    std::string message;
};

std::vector<LogLine> ReadServiceLog(const std::string& path);

// Index of the first record at or after `from` equal in tag, priority and text, or -1.
int FindRecord(const std::vector<LogLine>& records, const std::string& tag, char priority,
               const std::string& message, int from = 0);
size_t CountRecords(const std::vector<LogLine>& records, const std::string& tag, char priority,
                    const std::string& message);

}  // namespace vyr_test::e2e
