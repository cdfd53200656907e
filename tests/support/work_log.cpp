// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "work_log.h"

#include <android/log.h>

#include <cstdio>

namespace vyr_test {

std::string Hex(int32_t value) {
    char text[16];
    snprintf(text, sizeof(text), "%x", static_cast<unsigned>(value));
    return text;
}

std::string EnableWorkLine(int32_t mode, int count, int32_t handle, int period, int active,
                           int sensor_type) {
    return "EnableWork mode " + std::to_string(mode) + ", enable count " + std::to_string(count) +
           ", handle:" + Hex(handle) + " sampling/active period " + std::to_string(period) + "/" +
           std::to_string(active) + ", sensor type:" + std::to_string(sensor_type);
}

std::string DisableWorkLine(int32_t mode, int count, int32_t handle, int active, int sensor_type) {
    return "DisableWork mode " + std::to_string(mode) + ", enable count " + std::to_string(count) +
           ", handle:" + Hex(handle) + ", active_period:" + std::to_string(active) +
           ", sensor type:" + std::to_string(sensor_type);
}

size_t CountWorkLogs(const std::vector<LogRecord>& records, const std::string& work,
                     int32_t handle) {
    // EnableWork prints "handle:%x sampling", DisableWork "handle:%x, active_period".
    const std::string needle = "handle:" + Hex(handle) + (work == "EnableWork" ? " " : ",");
    size_t count = 0;
    for (const auto& record : records) {
        if (record.tag == "vyrservice" && record.priority == ANDROID_LOG_INFO &&
            record.message.rfind(work + " ", 0) == 0 &&
            record.message.find(needle) != std::string::npos) {
            ++count;
        }
    }
    return count;
}

}  // namespace vyr_test
