#include "binder_test_env.h"

#include <stdlib.h>

#include <filesystem>

namespace vyr_binder_test {

ScopedRegistryDir::ScopedRegistryDir() {
    char templ[] = "/tmp/vyr-binder-test-XXXXXX";
    const char* made = mkdtemp(templ);
    path_ = made == nullptr ? std::string() : made;
    setenv("VYR_BINDER_DIR", path_.c_str(), 1);
}

ScopedRegistryDir::~ScopedRegistryDir() {
    unsetenv("VYR_BINDER_DIR");
    std::error_code ignored;
    if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
}

}  // namespace vyr_binder_test
