// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <set>

namespace vyr_test::apex {

// The process's open inotify instances, by descriptor.
std::set<int> InotifyDescriptors();

}  // namespace vyr_test::apex
