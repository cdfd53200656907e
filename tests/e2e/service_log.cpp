// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_log.h"

#include "test_files.h"

namespace vyr_test::e2e {

namespace {

bool AllOf(const std::string& text, const char* allowed) {
    return !text.empty() && text.find_first_not_of(allowed) == std::string::npos;
}

// Splits "<tag> <P> <MM-DD> <hh:mm:ss[.fff]> <pid> <tid> <message>" (numbers may be padded with
// blanks); false for a line that does not start a record.
bool ParseHeader(const std::string& line, LogLine* record) {
    std::string fields[6];
    size_t at = 0;
    for (std::string& field : fields) {
        at = line.find_first_not_of(' ', at);
        if (at == std::string::npos) return false;
        const size_t end = line.find(' ', at);
        if (end == std::string::npos) return false;
        field = line.substr(at, end - at);
        at = end;
    }
    if (fields[1].size() != 1 || std::string("VDIWEF").find(fields[1][0]) == std::string::npos ||
        !AllOf(fields[2], "0123456789-") || !AllOf(fields[3], "0123456789:.") ||
        !AllOf(fields[4], "0123456789") || !AllOf(fields[5], "0123456789")) {
        return false;
    }
    record->tag = fields[0];
    record->priority = fields[1][0];
    record->message = line.substr(at + 1);
    return true;
}

}  // namespace

std::vector<LogLine> ReadServiceLog(const std::string& path) {
    std::vector<LogLine> records;
    for (const std::string& line : vyr_test::SplitLines(vyr_test::ReadFile(path))) {
        LogLine record;
        if (ParseHeader(line, &record)) {
            records.push_back(record);
        } else if (!records.empty()) {
            records.back().message += "\n" + line;
        }
    }
    return records;
}

int FindRecord(const std::vector<LogLine>& records, const std::string& tag, char priority,
               const std::string& message, int from) {
    for (size_t i = from; i < records.size(); ++i) {
        const LogLine& record = records[i];
        if (record.tag == tag && record.priority == priority && record.message == message) {
            return static_cast<int>(i);
        }
    }
    return -1;
}

size_t CountRecords(const std::vector<LogLine>& records, const std::string& tag, char priority,
                    const std::string& message) {
    size_t count = 0;
    for (int i = FindRecord(records, tag, priority, message); i >= 0;
         i = FindRecord(records, tag, priority, message, i + 1)) {
        ++count;
    }
    return count;
}

}  // namespace vyr_test::e2e
