// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "stream_command.h"

#include <vyr/sensor_client.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <thread>

#include "boot_clock.h"
#include "event_format.h"
#include "event_queue.h"
#include "result_text.h"
#include "stop_signal.h"

namespace vyrctl {

using aidl::android::vyr::Event;
using std::chrono::milliseconds;
using std::chrono::steady_clock;
using vyr::SensorClient;

namespace {

constexpr milliseconds kWaitSlice{50};

class Stream : public vyr::SensorClientListener {
  public:
    Stream(const Connection& connection, const StreamOptions& options, LineWriter* out,
           LineWriter* err)
        : connection_(connection), options_(options), out_(out), err_(err) {}

    int Run() {
        // The service's death notice arrives on the pool, as callback events do.
        Connection::StartThreadPool();
        vyr::SensorSettings settings;
        settings.mode = options_.mode;
        settings.period_ms = options_.period_ms;
        settings.use_callback = options_.use_callback;
        if (options_.low_power) settings.low_power = true;
        settings.max_interface_version = options_.interface_version;
        vyr::ReattachPolicy policy;
        policy.reattach = options_.reconnect;
        SensorClient client(settings, this, policy);
        client_ = &client;
        const int32_t result = client.Start(connection_.service());
        if (result != 0) {
            err_->WriteLine(std::string("error: open ") + ModeName(options_.mode) + " -> " +
                            DescribeResult(result));
            return 1;
        }
        err_->WriteLine(std::string("streaming ") + ModeName(options_.mode) + " (handle " +
                        std::to_string(client.handle()) + ", every " +
                        std::to_string(options_.period_ms) + " ms, " +
                        (options_.use_callback ? "callback" : "poll") + "); Ctrl-C to stop");
        const int exit_status = Loop();
        const int32_t handle = client.handle();
        client.Stop();
        if (handle != 0) {
            err_->WriteLine("stopped after " + std::to_string(printed_) + " events; handle " +
                            std::to_string(handle) + " disabled and closed");
        }
        return exit_status;
    }

    void OnEvent(const Event& event) override {
        queue_.Push({event, BootTimeNs()});
        if (options_.callback_delay_ms > 0) {
            std::this_thread::sleep_for(std::chrono::milliseconds(options_.callback_delay_ms));
        }
    }

    void OnServiceLost(int32_t handle) override {
        if (!options_.reconnect) {
            err_->WriteLine("error: vyrservice died");
            ended_ = true;
            return;
        }
        err_->WriteLine("service lost (handle " + std::to_string(handle) +
                        "); waiting for it to start again");
    }

    void OnOpenRefused(int32_t result, int attempt, milliseconds retry_in) override {
        err_->WriteLine("open -> " + DescribeResult(result) + "; trying again in " +
                        std::to_string(retry_in.count()) + " ms (attempt " +
                        std::to_string(attempt) + ")");
    }

    void OnResumed(int32_t old_handle, int32_t new_handle, milliseconds since_last) override {
        err_->WriteLine("service restarted: handle " + std::to_string(old_handle) + " -> " +
                        std::to_string(new_handle) + ", " + std::to_string(since_last.count()) +
                        " ms without events");
    }

    void OnGaveUp(const std::string& reason) override {
        err_->WriteLine("error: gave up re-attaching to vyrservice: " + reason);
        ended_ = true;
    }

    void OnSettingRefused(const std::string& setting, int32_t result) override {
        // A refusal (range handles have no low-power mode) is worth a warning, not the end.
        err_->WriteLine("warning: " + setting + " -> " + DescribeResult(result) +
                        (setting == "low power"
                             ? " (only the light sensor has a low-power mode); going on without"
                             : "; going on without"));
    }

  private:
    int Loop() {
        auto start = steady_clock::now();
        std::optional<steady_clock::time_point> end;
        if (options_.seconds) {
            end = start + std::chrono::duration_cast<steady_clock::duration>(
                              std::chrono::duration<double>(*options_.seconds));
        }
        // Polling faster than the period catches every sample of the sensor once.
        milliseconds poll_interval(std::max(1, options_.period_ms / 2));
        while (!Done(end)) {
            if (ended_) return 1;
            if (options_.use_callback) {
                if (std::optional<ReceivedEvent> received = queue_.Pop(kWaitSlice)) {
                    Print(received->event, received->received_boottime_ns);
                }
                continue;
            }
            Event event{};
            const int32_t result = client_->Poll(&event);
            if (result == 0) {
                Print(event, BootTimeNs());
            } else if (result != -61 && result != SensorClient::kNotAttached) {
                err_->WriteLine("error: poll -> " + DescribeResult(result));
                return 1;
            }
            auto wait = poll_interval;
            if (end) {
                auto left = std::chrono::duration_cast<milliseconds>(*end - steady_clock::now());
                wait = std::clamp(left, milliseconds(0), poll_interval);
            }
            StopSignal::SleepFor(wait);
        }
        return 0;
    }

    bool Done(const std::optional<steady_clock::time_point>& end) const {
        if (StopSignal::Requested()) return true;
        if (options_.count && printed_ >= *options_.count) return true;
        return end && steady_clock::now() >= *end;
    }

    void Print(const Event& event, int64_t received_boottime_ns) {
        if (options_.count && printed_ >= *options_.count) return;
        ++printed_;
        out_->WriteLine(options_.json ? FormatEventJson(options_.mode, client_->handle(), event,
                                                        received_boottime_ns)
                                      : FormatEventReadable(options_.mode, event));
    }

    const Connection& connection_;
    const StreamOptions& options_;
    LineWriter* out_;
    LineWriter* err_;
    SensorClient* client_ = nullptr;
    // Set on the client's thread: the service is gone for good.
    std::atomic<bool> ended_{false};
    int64_t printed_ = 0;
    EventQueue queue_;
};

}  // namespace

int RunStream(const Connection& connection, const StreamOptions& options, LineWriter* out,
              LineWriter* err) {
    return Stream(connection, options, out, err).Run();
}

}  // namespace vyrctl
