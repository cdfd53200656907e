// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The fixture of every in-process suite of the service (service, data path, display): the
// service built here on the sensor doubles with a scripted property source and no start-up
// delay, the calls that tests make on it, and, at the end of each test, the check that no
// thread of the service is left.

#include <aidl/android/vyr/Event.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <string>

#include "log_capture.h"
#include "vyrservice.h"

namespace vyr_test {

inline constexpr char kTag[] = "vyrservice";
inline constexpr char kAlsProperty[] = "persist.vendor.camera.vyr_supported";
inline constexpr char kRangeProperty[] = "persist.vendor.camera.vyr_range_supported";
inline constexpr std::chrono::milliseconds kWait{10000};
// A display-state path that cannot be opened: the display monitor ends at once.
inline constexpr char kNoDisplayPath[] = "/nonexistent/vyr-test/display-state";

class ServiceFixture : public ::testing::Test {
  protected:
    void SetUp() override;
    // Destroys the service; fails the test if a thread of it is left.
    void TearDown() override;

    // Properties as given (the platform's defaults for the others), no start-up delay.
    static android::vyr::binder::ServiceConfig Config(
        std::map<std::string, bool> properties, const std::string& display_path = kNoDisplayPath);
    // Index of the mode block that serves `mode`.
    static size_t BlockOf(int32_t mode);

    // Both sensors present unless said otherwise, watching display_path_. With no display state
    // to watch, returns once the display monitor has ended, so that tests count threads from a
    // settled service.
    void MakeService(bool als = true, bool range = true);
    // Destroys the service made before, if any, and builds one with `config`.
    void MakeService(const android::vyr::binder::ServiceConfig& config);
    // Drops the test's reference, which destroys the service; false if that did not finish.
    virtual bool DestroyService();

    // The service's answers to Open, Enable and PollOnce; the binder calls themselves must
    // succeed. Handles that Open gives and Enable enables are remembered until disabled here.
    int32_t Open(int32_t mode);
    int32_t Enable(int32_t handle, int32_t period);
    void Disable(int32_t handle);
    int32_t Poll(int32_t handle, aidl::android::vyr::Event* event);
    // Opens a client of `mode` and enables it; waits until the worker has applied the item.
    int32_t OpenAndEnable(int32_t mode, int32_t period);
    // Disables and waits until the worker has applied the item.
    void DisableAndWait(int32_t handle);

    // Records of the worker's `work` line ("EnableWork" / "DisableWork") for `handle`.
    size_t WorkLogCount(const std::string& work, int32_t handle);
    bool WaitForWorkLog(const std::string& work, int32_t handle, size_t count = 1);

    LogCapture log_;
    std::shared_ptr<android::vyr::binder::VYRService> service_;
    // What MakeService(als, range) gives the display monitor to watch.
    std::string display_path_ = kNoDisplayPath;
    size_t baseline_threads_ = 0;
    std::string baseline_names_;
    // Mode of every handle opened through Open().
    std::map<int32_t, int32_t> modes_;
    // Handles enabled through Enable() and not disabled through this fixture since.
    std::set<int32_t> enabled_;
};

}  // namespace vyr_test
