// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>

namespace vyr_test::binder {

// A fresh registry directory for one test, set as VYR_BINDER_DIR; removed by the destructor.
class ScopedRegistryDir {
  public:
    ScopedRegistryDir();
    ~ScopedRegistryDir();
    ScopedRegistryDir(const ScopedRegistryDir&) = delete;
    ScopedRegistryDir& operator=(const ScopedRegistryDir&) = delete;

    const std::string& path() const { return path_; }

  private:
    std::string path_;
};

}  // namespace vyr_test::binder
