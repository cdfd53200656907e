// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The "--name value" options of the benchmark programs.

#include <string>
#include <variant>
#include <vector>

namespace vyr_bench {

// One option and the field that its value goes into.
struct Flag {
    const char* name;
    std::variant<int*, double*, std::string*> value;
};

// Reads "--name value" pairs into the fields of `flags`; a name left without a value is ignored.
// False, after saying so on stderr, at a name that none of `flags` has.
bool ParseFlags(int argc, char** argv, const std::vector<Flag>& flags);

}  // namespace vyr_bench
