#include "service_log.h"

#include <fstream>
#include <regex>

namespace vyr_e2e {

std::vector<LogLine> ReadServiceLog(const std::string& path) {
    static const std::regex kHeader(
        R"(^(\S+) ([VDIWEF]) \d\d-\d\d \d\d:\d\d:\d\d(\.\d+)? +\d+ +\d+ (.*)$)");
    std::vector<LogLine> records;
    std::ifstream in(path);
    std::string line;
    while (std::getline(in, line)) {
        std::smatch match;
        if (std::regex_match(line, match, kHeader)) {
            records.push_back({match[1], match[2].str()[0], match[4]});
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

}  // namespace vyr_e2e
