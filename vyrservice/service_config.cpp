// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_config.h"

#include <cutils/properties.h>

namespace android {
namespace vyr {
namespace binder {

ServiceConfig ServiceConfig::Production() {
    ServiceConfig config;
    config.get_bool_property = [](const char* key, bool default_value) {
        return property_get_bool(key, default_value);
    };
    // The sensors' firmware needs time after boot before it accepts the first command.
    config.startup_delay = std::chrono::milliseconds(4000);
    config.display_state_path = "/sys/class/backlight/panel0-backlight/state";
    return config;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
