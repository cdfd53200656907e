// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_status.h>

#include <string>

namespace vyr_binder {

// The service registry: one directory per user (or per test, through VYR_BINDER_DIR). A process
// that publishes services listens on "<key>.sock" and holds an flock on "<key>.lock" for its
// life; each name is a symlink "svc.<name>" to the owner's key.
class Registry {
  public:
    // The directory to use now, created if missing; false (with a log line) when it is unusable.
    static bool Dir(std::string* dir);
    static bool IsValidName(const std::string& name);

    // The file, inside the directory, that names the owner of `name`.
    static std::string EntryFileName(const std::string& name);
    static std::string SocketPath(const std::string& dir, const std::string& key);
    static std::string LockPath(const std::string& dir, const std::string& key);

    // Points the name at `key`, in place of any earlier registration. EX_ILLEGAL_STATE when the
    // registry cannot be written.
    static binder_exception_t Publish(const std::string& dir, const std::string& name,
                                      const std::string& key);
    // Removes the name if it still points at `key`.
    static void Unpublish(const std::string& dir, const std::string& name, const std::string& key);
    // The key of the process that published the name, if that process is alive.
    static bool Resolve(const std::string& dir, const std::string& name, std::string* key);
    static bool IsAlive(const std::string& dir, const std::string& key);
};

}  // namespace vyr_binder
