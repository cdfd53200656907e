// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "property_file.h"

#include <android-base/strings.h>

#include <fstream>

namespace host_properties {

std::optional<std::string> LookUp(const std::string& path, const std::string& key) {
    std::ifstream file(path);
    if (!file) return std::nullopt;
    std::optional<std::string> found;
    std::string line;
    while (std::getline(file, line)) {
        // A file written on another system may end its lines with CR LF.
        if (!line.empty() && line.back() == '\r') line.pop_back();
        const std::string trimmed = android::base::Trim(line);
        if (trimmed.empty() || trimmed[0] == '#') continue;
        const size_t equals = line.find('=');
        if (equals == std::string::npos) continue;
        if (android::base::Trim(line.substr(0, equals)) != key) continue;
        found = line.substr(equals + 1);
    }
    return found;
}

}  // namespace host_properties
