// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The hostname is per UTS namespace and unshare() moves only the calling thread; doing it first
// thing in main(), before gtest or the binder runtime start a thread, puts the whole test process
// in the namespace, so that sethostname() never touches the machine's own name. A mount namespace
// of its own likewise keeps the test's FUSE mounts private.

#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>

#include <cerrno>
#include <cstring>
#include <thread>

#include "uts_namespace.h"

namespace vyr_test::display {
namespace {

bool g_have_namespace = false;
bool g_private_mounts = false;
std::string g_problem;

}  // namespace

bool HaveOwnUtsNamespace() {
    return g_have_namespace;
}

const std::string& UtsNamespaceProblem() {
    return g_problem;
}

bool HavePrivateMounts() {
    return g_private_mounts;
}

}  // namespace vyr_test::display

int main(int argc, char** argv) {
    if (unshare(CLONE_NEWUTS | CLONE_NEWNS) == 0) {
        vyr_test::display::g_have_namespace = true;
        // File systems that tests mount stay invisible to the machine and die with the process.
        vyr_test::display::g_private_mounts =
            mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0;
    } else {
        vyr_test::display::g_problem =
            std::string("cannot create UTS and mount namespaces (needs root / CAP_SYS_ADMIN): ") +
            strerror(errno);
    }
    // Sanitizer runtimes start a helper thread with the process's first thread; start it now so
    // that the tests' thread counts see only the service's threads come and go.
    std::thread([] {}).join();
    testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
