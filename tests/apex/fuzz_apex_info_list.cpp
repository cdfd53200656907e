// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Feeds arbitrary file contents to the info list reader.

#include <android/log.h>
#include <apex_update_listener.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

namespace vyr_test::apex {
namespace {

constexpr char kPackage[] = "com.tarven.nomil.camera.hal";

// Failures are expected on most inputs; logging each one would only slow the fuzzer down.
void DropLog(const __android_logger_data*, const char*) {}

std::string* g_directory = nullptr;
std::string* g_path = nullptr;

void RemoveFiles() {
    unlink(g_path->c_str());
    rmdir(g_directory->c_str());
}

void SetUp() {
    const char* tmp = getenv("TMPDIR");
    std::string pattern =
        std::string(tmp != nullptr && *tmp != '\0' ? tmp : "/tmp") + "/fuzz_apex_info_list.XXXXXX";
    if (mkdtemp(pattern.data()) == nullptr) abort();
    g_directory = new std::string(pattern);
    g_path = new std::string(pattern + "/apex-info-list.xml");
    atexit(RemoveFiles);
    __android_log_set_logger(DropLog);
}

}  // namespace
}  // namespace vyr_test::apex

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    using namespace vyr_test::apex;
    if (g_path == nullptr) SetUp();
    int fd = open(g_path->c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    if (fd < 0) abort();
    for (size_t done = 0; done < size;) {
        ssize_t written = write(fd, data + done, size - done);
        if (written <= 0) abort();
        done += static_cast<size_t>(written);
    }
    close(fd);

    auto infos = ApexUpdateListener::TrySlurpInfo(kPackage, *g_path);
    if (infos.has_value()) {
        // A result is never empty and holds only the package asked for, in order.
        if (infos->empty()) abort();
        const ApexUpdateListener::Info* previous = nullptr;
        for (const auto& info : *infos) {
            if (info.module_name != kPackage) abort();
            if (previous != nullptr && !(*previous < info)) abort();
            previous = &info;
        }
    }
    return 0;
}
