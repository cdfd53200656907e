// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "test_files.h"

namespace vyr_test {

// A private directory for one test's files, removed with everything in it.
class TempDir {
  public:
    TempDir() {
        path_ = MakeTempDir("vyr_test_");
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

}  // namespace vyr_test
