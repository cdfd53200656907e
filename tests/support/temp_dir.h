// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>

#include "test_files.h"

// A private directory for one test's files, removed with everything in it.
class TempDir {
  public:
    TempDir() {
        path_ = vyr_test::MakeTempDir("vyr_test_");
        if (path_.empty()) ADD_FAILURE() << "cannot make a temporary directory";
    }
    ~TempDir() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    std::string Write(const std::string& name, const std::string& contents) const {
        const std::string file = path_ + "/" + name;
        std::ofstream(file, std::ios::trunc) << contents;
        return file;
    }
    std::string Path(const std::string& name) const { return path_ + "/" + name; }

  private:
    std::string path_;
};

// `key=value` lines of a file; empty when it cannot be read.
inline std::map<std::string, std::string> ReadKeyValues(const std::string& path) {
    std::map<std::string, std::string> values;
    std::ifstream file(path);
    std::string line;
    while (std::getline(file, line)) {
        const size_t equals = line.find('=');
        if (equals != std::string::npos) values[line.substr(0, equals)] = line.substr(equals + 1);
    }
    return values;
}
