// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Host implementations of the libcutils property readers that Debian's libcutils declares but
// does not ship. Properties come from the file named by VYR_PROPERTY_FILE.

#include <cutils/properties.h>

#include <cerrno>
#include <cinttypes>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string>

#include "property_file.h"

namespace {

constexpr char kPropertyFileVariable[] = "VYR_PROPERTY_FILE";

std::optional<std::string> ReadProperty(const char* key) {
    if (key == nullptr) return std::nullopt;
    const char* path = getenv(kPropertyFileVariable);
    if (path == nullptr || *path == '\0') return std::nullopt;
    return host_properties::LookUp(path, key);
}

// As the platform parses numbers: any base strtoimax accepts, text after the number ignored, and
// the default for no number, overflow or a value outside [lower, upper].
intmax_t GetInteger(const char* key, intmax_t lower, intmax_t upper, intmax_t default_value) {
    char value[PROPERTY_VALUE_MAX];
    if (key == nullptr || property_get(key, value, "") == 0) return default_value;
    const int saved_errno = errno;
    errno = 0;
    char* end = nullptr;
    intmax_t result = strtoimax(value, &end, 0);
    const bool overflow = errno == ERANGE;
    errno = saved_errno;
    if (overflow || end == value || result < lower || result > upper) result = default_value;
    return result;
}

}  // namespace

extern "C" int property_get(const char* key, char* value, const char* default_value) {
    std::optional<std::string> found = ReadProperty(key);
    std::string text;
    if (found && !found->empty()) {
        text = *found;
    } else if (default_value != nullptr) {
        text = default_value;
    }
    // The platform never stores longer values; keep callers' PROPERTY_VALUE_MAX buffers safe.
    if (text.size() > PROPERTY_VALUE_MAX - 1) text.resize(PROPERTY_VALUE_MAX - 1);
    memcpy(value, text.c_str(), text.size() + 1);
    return static_cast<int>(text.size());
}

extern "C" int8_t property_get_bool(const char* key, int8_t default_value) {
    std::optional<std::string> found = ReadProperty(key);
    if (!found) return default_value;
    const std::string& v = *found;
    if (v == "1" || v == "y" || v == "yes" || v == "on" || v == "true") return 1;
    if (v == "0" || v == "n" || v == "no" || v == "off" || v == "false") return 0;
    return default_value;
}

extern "C" int64_t property_get_int64(const char* key, int64_t default_value) {
    return static_cast<int64_t>(GetInteger(key, INT64_MIN, INT64_MAX, default_value));
}

extern "C" int32_t property_get_int32(const char* key, int32_t default_value) {
    return static_cast<int32_t>(GetInteger(key, INT32_MIN, INT32_MAX, default_value));
}
