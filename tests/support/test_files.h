// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Files of tests and tools: a private temporary directory, and a whole file as text.

#include <string>

namespace vyr_test {

// Makes a new directory /tmp/<prefix>XXXXXX; empty on failure.
std::string MakeTempDir(const std::string& prefix);
// The whole file; empty when it cannot be read.
std::string ReadFile(const std::string& path);

}  // namespace vyr_test
