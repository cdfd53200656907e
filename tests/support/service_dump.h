// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// A binder's dump as its caller reads it: through a pipe, whether the object is local or in
// another process.

#include <android/binder_ibinder.h>

#include <string>
#include <vector>

namespace vyr_test {

struct DumpResult {
    binder_status_t status;
    std::string text;
};

DumpResult DumpOf(AIBinder* binder, const std::vector<std::string>& args = {});

}  // namespace vyr_test
