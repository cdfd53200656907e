// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "binder_test_env.h"

#include <stdlib.h>

#include <filesystem>

#include "test_files.h"

namespace vyr_test::binder {

ScopedRegistryDir::ScopedRegistryDir() {
    path_ = vyr_test::MakeTempDir("vyr-binder-test-");
    setenv("VYR_BINDER_DIR", path_.c_str(), 1);
}

ScopedRegistryDir::~ScopedRegistryDir() {
    unsetenv("VYR_BINDER_DIR");
    std::error_code ignored;
    if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
}

}  // namespace vyr_test::binder
