// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>

namespace vyr_test::display {

// Set by main() before any thread exists: whether this process has a UTS namespace of its own,
// and if not, why.
bool HaveOwnUtsNamespace();
const std::string& UtsNamespaceProblem();
// Whether mounts made by this process are its own (a private mount namespace).
bool HavePrivateMounts();

}  // namespace vyr_test::display
