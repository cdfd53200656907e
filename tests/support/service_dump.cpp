// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_dump.h"

#include <fcntl.h>
#include <unistd.h>

#include <thread>

namespace vyr_test {

DumpResult DumpOf(AIBinder* binder, const std::vector<std::string>& args) {
    int fds[2];
    if (pipe2(fds, O_CLOEXEC) != 0) return {STATUS_UNKNOWN_ERROR, ""};
    // Read while the dump writes: a dump larger than the pipe's buffer must not block.
    std::string text;
    std::thread reader([&text, fd = fds[0]] {
        char buffer[4096];
        ssize_t n;
        while ((n = read(fd, buffer, sizeof(buffer))) > 0) text.append(buffer, n);
    });
    std::vector<const char*> argv;
    for (const std::string& arg : args) argv.push_back(arg.c_str());
    const binder_status_t status =
        AIBinder_dump(binder, fds[1], argv.data(), static_cast<uint32_t>(argv.size()));
    close(fds[1]);
    reader.join();
    close(fds[0]);
    return {status, text};
}

}  // namespace vyr_test
