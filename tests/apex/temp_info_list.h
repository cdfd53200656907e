// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>

namespace vyr_test::apex {

// An info list file in a fresh temporary directory, removed with it.
class TempInfoList {
  public:
    TempInfoList();
    ~TempInfoList();
    TempInfoList(const TempInfoList&) = delete;
    TempInfoList& operator=(const TempInfoList&) = delete;

    const std::string& path() const { return path_; }
    const std::string& directory() const { return directory_; }

    // Replaces the contents with one write at offset 0, padded with new lines to at least the
    // old size. The file is never truncated, so a watcher sees exactly one modification and can
    // never read it empty or half-written. Returns false (with a test failure) on error.
    bool Write(const std::string& content);

  private:
    std::string directory_;
    std::string path_;
    size_t size_ = 0;
};

}  // namespace vyr_test::apex
