// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <future>
#include <memory>
#include <string>

#include "fuse_attribute.h"
#include "service_fixture.h"
#include "vyrservice_test_peer.h"

namespace vyr_test::display {

using namespace std::chrono_literals;

// The kernel's hostname attribute: poll() reports POLLPRI|POLLERR on every sethostname(), and a
// read returns this namespace's hostname and a newline.
inline constexpr char kStatePath[] = "/proc/sys/kernel/hostname";
inline constexpr int32_t kAlsBlock = 0;
inline constexpr int32_t kRangeBlock = 2;

// The service's display monitor watches the hostname attribute, and the test drives the "panel"
// through sethostname(). Needs a UTS namespace of its own (root); skips without one, and fails
// under CI=true.
class DisplayTest : public vyr_test::ServiceFixture {
  protected:
    void SetUp() override;
    void TearDown() override;

    // Builds the service with both sensors, watching a FUSE attribute (fuse_) whose content and
    // read errors the test chooses. Skips (fails under CI=true) where FUSE is unavailable; fuse_
    // stays null then, and the test must return.
    void MakeServiceOnFuse();
    // Destroys the service on another thread, waking the display monitor (which blocks in poll()
    // without a time-out) until the destruction has finished. False if it did not within kWait.
    bool DestroyService() override;

    // Sets the attribute's content; the monitor reads it with a trailing newline.
    void Panel(const std::string& state);
    // Whether the display monitor has the state attribute open.
    static bool MonitorWatching();
    static bool WaitForMonitorWatching(bool watching);

    // Records "Enable/Disable sensor for display state: <shown>": `shown` is what the monitor
    // read, at most 49 bytes, usually the panel state and a newline.
    size_t EnableLines(const std::string& shown);
    size_t DisableLines(const std::string& shown);
    bool WaitForEnableLine(const std::string& shown, size_t count = 1);
    bool WaitForDisableLine(const std::string& shown, size_t count = 1);
    // Waits until the monitor has read `length` bytes from the start of the attribute: the
    // position of its descriptor tells how far its last read went.
    static bool WaitForMonitorRead(size_t length);
    // Waits until the light or range block satisfies `condition`.
    bool WaitForBlock(size_t index,
                      const std::function<bool(const vyr_test::ModeBlockSnapshot&)>& condition);
    // Waits until the light block counts `count` enabled handles.
    bool WaitForEnableCount(int32_t count);
    // Starts destroying the service on another thread.
    std::future<void> StartDestruction();
    // Notifies the display monitor's attribute again every 20 ms (waking the monitor without
    // changing what it reads) until `done` is true; false on time-out.
    bool NotifyUntil(const std::function<bool()>& done, std::chrono::milliseconds timeout);
    // Exact text of the worker's lines for mode 1.
    static std::string EnableWorkText(int32_t count, int32_t handle, int32_t period, int32_t active);
    static std::string DisableWorkText(int32_t count, int32_t handle, int32_t active);

    // The only handle with a period in the light block: the display's, while no client enabled.
    int32_t DisplayHandle();

    std::string panel_ = "Off";
    std::unique_ptr<FuseAttribute> fuse_;
};

}  // namespace vyr_test::display
