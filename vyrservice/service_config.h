// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <chrono>
#include <functional>
#include <string>

namespace android {
namespace vyr {
namespace binder {

// What the service reads from its environment at construction. Production() is the device's;
// tests supply their own property source, no start-up delay and a display-state file of their
// choosing.
struct ServiceConfig {
    std::function<bool(const char* key, bool default_value)> get_bool_property;
    // Waited before any sensor is touched.
    std::chrono::milliseconds startup_delay{0};
    std::string display_state_path;

    static ServiceConfig Production();
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
