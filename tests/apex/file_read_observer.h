// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <chrono>
#include <string>

namespace vyr_test::apex {

// Tells when a reader has finished reading a file: the listener's re-read closes the file it
// opened read-only, which is the moment its result is settled.
class FileReadObserver {
  public:
    explicit FileReadObserver(const std::string& path);
    ~FileReadObserver();
    FileReadObserver(const FileReadObserver&) = delete;
    FileReadObserver& operator=(const FileReadObserver&) = delete;

    // Forgets reads seen so far.
    void Drain();
    // Waits for the next read to finish; false on time-out.
    bool WaitForRead(std::chrono::milliseconds timeout);

  private:
    int fd_ = -1;
    size_t pending_ = 0;

    // Reads whatever events are queued; false on error.
    bool Collect();
};

}  // namespace vyr_test::apex
