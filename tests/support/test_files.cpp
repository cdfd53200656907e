// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "test_files.h"

#include <android-base/strings.h>
#include <limits.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstdio>
#include <fstream>
#include <sstream>
#include <vector>

namespace vyr_test {

std::string MakeTempDir(const std::string& prefix) {
#if defined(__ANDROID__)
    const char* tmpdir = getenv("TMPDIR");
    const std::string base = tmpdir != nullptr ? tmpdir : "/data/local/tmp";
#else
    // Short, so that the sockets of a binder registry made in it fit a socket address.
    const std::string base = "/tmp";
#endif
    std::string pattern = base + "/" + prefix + "XXXXXX";
    std::vector<char> path(pattern.begin(), pattern.end());
    path.push_back('\0');
    return mkdtemp(path.data()) == nullptr ? std::string() : std::string(path.data());
}

std::string ReadFile(const std::string& path) {
    std::ifstream in(path);
    std::stringstream text;
    text << in.rdbuf();
    return text.str();
}

std::vector<std::string> SplitLines(const std::string& text) {
    std::vector<std::string> lines = android::base::Split(text, "\n");
    // What follows the last newline is a line only if it is not empty.
    if (lines.back().empty()) lines.pop_back();
    return lines;
}

std::map<std::string, std::string> ReadKeyValues(const std::string& path) {
    std::map<std::string, std::string> values;
    for (const std::string& line : SplitLines(ReadFile(path))) {
        const size_t equals = line.find('=');
        if (equals != std::string::npos) values[line.substr(0, equals)] = line.substr(equals + 1);
    }
    return values;
}

long ResidentKib(pid_t pid) {
    for (const std::string& line :
         SplitLines(ReadFile("/proc/" + std::to_string(pid) + "/status"))) {
        long kib = 0;
        if (sscanf(line.c_str(), "VmRSS: %ld kB", &kib) == 1) return kib;
    }
    return -1;
}

std::string ProgramBesideThisOne(const std::string& name) {
    char self[PATH_MAX] = {};
    const ssize_t length = readlink("/proc/self/exe", self, sizeof(self) - 1);
    const std::string path(self, length > 0 ? static_cast<size_t>(length) : 0);
    return path.substr(0, path.rfind('/') + 1) + name;
}

}  // namespace vyr_test
