// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <set>

namespace apex_test {

// The process's open inotify instances, by descriptor.
std::set<int> InotifyDescriptors();

}  // namespace apex_test
