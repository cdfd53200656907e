// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Files of tests and tools: a private temporary directory, a whole file as text, and the
// programs installed beside a test.

#include <string>

namespace vyr_test {

// Makes a new directory /tmp/<prefix>XXXXXX (on a device in TMPDIR, else /data/local/tmp);
// empty on failure.
std::string MakeTempDir(const std::string& prefix);
// The whole file; empty when it cannot be read.
std::string ReadFile(const std::string& path);
// The program `name` in the folder of the running one, where a device's test installs the
// programs it starts.
std::string ProgramBesideThisOne(const std::string& name);

}  // namespace vyr_test
