// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Files of tests and tools: a private temporary directory, a whole file as text, as lines or as
// `key=value` lines, a process's resident memory from /proc, and the programs installed beside a
// test.

#include <sys/types.h>

#include <map>
#include <string>
#include <vector>

namespace vyr_test {

// Makes a new directory /tmp/<prefix>XXXXXX (on a device in TMPDIR, else /data/local/tmp);
// empty on failure.
std::string MakeTempDir(const std::string& prefix);
// The whole file; empty when it cannot be read.
std::string ReadFile(const std::string& path);
// The lines of `text` without their newlines; a last line may lack its newline.
std::vector<std::string> SplitLines(const std::string& text);
// The `key=value` lines of a file, by key; empty when it cannot be read.
std::map<std::string, std::string> ReadKeyValues(const std::string& path);
// Resident memory of process `pid`, in KiB; -1 when unknown.
long ResidentKib(pid_t pid);
// The program `name` in the folder of the running one, where a device's test installs the
// programs it starts.
std::string ProgramBesideThisOne(const std::string& name);

}  // namespace vyr_test
