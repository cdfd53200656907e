// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "temp_info_list.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace vyr_test::apex {
namespace {

// A device has no /tmp; its shell and test runners write under /data/local/tmp.
#ifdef __ANDROID__
constexpr char kDefaultTempDir[] = "/data/local/tmp";
#else
constexpr char kDefaultTempDir[] = "/tmp";
#endif

}  // namespace

TempInfoList::TempInfoList() {
    const char* tmp = getenv("TMPDIR");
    std::string pattern = std::string(tmp != nullptr && *tmp != '\0' ? tmp : kDefaultTempDir) +
                          "/apex_update_listener_test.XXXXXX";
    std::vector<char> buffer(pattern.begin(), pattern.end());
    buffer.push_back('\0');
    if (mkdtemp(buffer.data()) == nullptr) {
        ADD_FAILURE() << "mkdtemp(" << pattern << "): " << strerror(errno);
        return;
    }
    directory_ = buffer.data();
    path_ = directory_ + "/apex-info-list.xml";
}

TempInfoList::~TempInfoList() {
    if (directory_.empty()) return;
    unlink(path_.c_str());
    rmdir(directory_.c_str());
}

bool TempInfoList::Write(const std::string& content) {
    std::string padded = content;
    if (padded.size() < size_) padded.append(size_ - padded.size(), '\n');
    int fd = open(path_.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    if (fd < 0) {
        ADD_FAILURE() << "open(" << path_ << "): " << strerror(errno);
        return false;
    }
    ssize_t written = pwrite(fd, padded.data(), padded.size(), 0);
    int error = errno;
    close(fd);
    if (written != static_cast<ssize_t>(padded.size())) {
        ADD_FAILURE() << "pwrite(" << path_ << ") wrote " << written << " of " << padded.size()
                      << ": " << strerror(error);
        return false;
    }
    size_ = padded.size();
    return true;
}

}  // namespace vyr_test::apex
