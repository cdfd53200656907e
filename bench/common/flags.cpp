// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "flags.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace vyr_bench {

bool ParseFlags(int argc, char** argv, const std::vector<Flag>& flags) {
    for (int i = 1; i + 1 < argc; i += 2) {
        const Flag* flag = nullptr;
        for (const Flag& candidate : flags) {
            if (strcmp(argv[i], candidate.name) == 0) flag = &candidate;
        }
        if (flag == nullptr) {
            fprintf(stderr, "unknown option %s\n", argv[i]);
            return false;
        }
        if (int* const* number = std::get_if<int*>(&flag->value)) {
            **number = atoi(argv[i + 1]);
        } else if (double* const* real = std::get_if<double*>(&flag->value)) {
            **real = atof(argv[i + 1]);
        } else {
            *std::get<std::string*>(flag->value) = argv[i + 1];
        }
    }
    return true;
}

}  // namespace vyr_bench
