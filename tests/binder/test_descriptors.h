// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Descriptors that the binder tests send across processes: files with known text, and who holds
// them.

#include <android/binder_auto_utils.h>
#include <sys/types.h>

#include <cstddef>
#include <string>

namespace vyr_test::binder {

// An anonymous file (memfd) named `name` that holds `text`. Close-on-exec, so that a helper
// spawned later does not inherit it and every one it holds came through binder.
ndk::ScopedFileDescriptor MakeTextFile(const std::string& name, const std::string& text);

// The file's text from its start, whatever the descriptor's offset; empty on error.
std::string ReadText(int fd);

// How many descriptors of process `pid` are open on anonymous files named `name`.
size_t CountOpenTextFiles(pid_t pid, const std::string& name);

// How many descriptors this process has open.
size_t CountOwnDescriptors();

}  // namespace vyr_test::binder
