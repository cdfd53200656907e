// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Abuse of the real service binary by hostile and buggy clients, bounded in count and time.
//
//   bench_abuse [--service PATH] [soak|headers|stalled]... [--clients N] [--honest N]
//               [--parallel N] [--connections N] [--seed N]
//
// With no scenario named, all three run. Exits non-zero if the service crashed or was left with
// a sensor on.

#include <unistd.h>

#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "abusive_client.h"
#include "scenarios.h"

namespace {

std::string SelfPath() {
    char path[PATH_MAX];
    const ssize_t length = readlink("/proc/self/exe", path, sizeof(path) - 1);
    return length > 0 ? std::string(path, static_cast<size_t>(length)) : std::string();
}

int Usage() {
    fprintf(stderr,
            "usage: bench_abuse [--service PATH] [soak|headers|stalled]... [--clients N]\n"
            "                   [--honest N] [--parallel N] [--connections N] [--seed N]\n");
    return 2;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 4 && strcmp(argv[1], "--client") == 0) {
        return vyr_bench::abuse::RunAbusiveClient(atoi(argv[2]), strcmp(argv[3], "callback") == 0);
    }
    vyr_bench::abuse::Options options;
    options.service_binary = VYRSERVICE_PATH;
    options.self = SelfPath();
    std::vector<std::string> scenarios;
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        const bool has_value = i + 1 < argc;
        if (arg == "--service" && has_value) {
            options.service_binary = argv[++i];
        } else if (arg == "--clients" && has_value) {
            options.clients = atoi(argv[++i]);
        } else if (arg == "--honest" && has_value) {
            options.honest = atoi(argv[++i]);
        } else if (arg == "--parallel" && has_value) {
            options.parallel = atoi(argv[++i]);
        } else if (arg == "--connections" && has_value) {
            options.connections = atoi(argv[++i]);
        } else if (arg == "--seed" && has_value) {
            options.seed = static_cast<unsigned>(strtoul(argv[++i], nullptr, 10));
        } else if (arg == "soak" || arg == "headers" || arg == "stalled") {
            scenarios.push_back(arg);
        } else {
            return Usage();
        }
    }
    if (scenarios.empty()) scenarios = {"soak", "headers", "stalled"};
    int failed = 0;
    for (const std::string& scenario : scenarios) {
        printf("\n== %s\n", scenario.c_str());
        fflush(stdout);
        int rc = scenario == "soak"      ? vyr_bench::abuse::RunSoak(options)
                 : scenario == "headers" ? vyr_bench::abuse::RunHeaders(options)
                                         : vyr_bench::abuse::RunStalled(options);
        fflush(stdout);
        failed |= rc;
    }
    return failed;
}
