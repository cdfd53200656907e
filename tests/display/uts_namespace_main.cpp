// The hostname is per UTS namespace and unshare() moves only the calling thread; doing it first
// thing in main(), before gtest or the binder runtime start a thread, puts the whole test process
// in the namespace, so that sethostname() never touches the machine's own name.

#include <gtest/gtest.h>
#include <sched.h>

#include <cerrno>
#include <cstring>

#include "uts_namespace.h"

namespace vyr_display_test {
namespace {

bool g_have_namespace = false;
std::string g_problem;

}  // namespace

bool HaveOwnUtsNamespace() {
    return g_have_namespace;
}

const std::string& UtsNamespaceProblem() {
    return g_problem;
}

}  // namespace vyr_display_test

int main(int argc, char** argv) {
    if (unshare(CLONE_NEWUTS) == 0) {
        vyr_display_test::g_have_namespace = true;
    } else {
        vyr_display_test::g_problem =
            std::string("cannot create a UTS namespace (needs root / CAP_SYS_ADMIN): ") +
            strerror(errno);
    }
    testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
