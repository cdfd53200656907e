// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_fixture.h"

#include <vector>

#include "sensor_modes.h"
#include "work_log.h"

namespace vyr_test {

using android::vyr::binder::ServiceConfig;

ServiceConfig ServiceFixture::Config(std::map<std::string, bool> properties,
                                     const std::string& display_path) {
    ServiceConfig config;
    config.get_bool_property = [properties](const char* key, bool default_value) {
        auto it = properties.find(key);
        return it == properties.end() ? default_value : it->second;
    };
    config.startup_delay = std::chrono::milliseconds(0);
    config.display_state_path = display_path;
    return config;
}

size_t ServiceFixture::BlockOf(int32_t mode) {
    return mode == android::vyr::binder::kRangeMode ? 2 : 0;
}

size_t ServiceFixture::WorkLogCount(const std::string& work, int32_t handle) {
    return CountWorkLogs(log_.Records(), work, handle);
}

bool ServiceFixture::WaitForWorkLog(const std::string& work, int32_t handle, size_t count) {
    return log_.WaitUntil(
        [&](const std::vector<LogRecord>& records) {
            return CountWorkLogs(records, work, handle) >= count;
        },
        kWait);
}

}  // namespace vyr_test
