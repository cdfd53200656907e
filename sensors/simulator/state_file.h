// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <map>
#include <mutex>
#include <string>

namespace sensors_sim {

// Publishes the simulated sensors' power state to the file named by VYR_SENSOR_STATE_FILE, so
// that another process can see a sensor switched on or off. The file holds sorted `key=value`
// lines and is replaced atomically on every change.
class StateFile {
  public:
    static StateFile& Get();

    // Sets the given keys; the file is rewritten when any of them changed.
    void Set(const std::map<std::string, int>& values);

  private:
    StateFile() = default;
    void WriteLocked();

    std::mutex mutex_;
    std::map<std::string, int> values_;
};

inline constexpr char kStateFileVariable[] = "VYR_SENSOR_STATE_FILE";

}  // namespace sensors_sim
