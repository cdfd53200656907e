// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <optional>
#include <string>

namespace host_properties {

// Looks a key up in a build.prop-style file: `key=value` lines, `#` comments and blank lines.
// Whitespace around the key is ignored; the value is everything after the first `=`, as written.
// A later line for the same key wins. Empty when the file or the key is absent.
std::optional<std::string> LookUp(const std::string& path, const std::string& key);

}  // namespace host_properties
