// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "demo_view.h"

#include <unistd.h>

#include "demo_screen.h"
#include "event_format.h"
#include "result_text.h"
#include "stop_signal.h"

namespace vyrctl {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

namespace {

constexpr milliseconds kPollInterval{50};
constexpr double kTerminalRefreshS = 0.25;
constexpr double kPlainRefreshS = 1.0;

// One sensor of the view: its handle while open, or why it could not be used.
struct Sensor {
    int32_t mode;
    int32_t handle = 0;
    bool open = false;
    bool enabled = false;
};

class DemoView {
  public:
    DemoView(const Connection& connection, const DemoViewOptions& options, LineWriter* out,
             LineWriter* err)
        : connection_(connection),
          service_(connection.service()),
          options_(options),
          out_(out),
          err_(err),
          tty_(isatty(STDOUT_FILENO)) {
        state_.total_s = options.seconds;
        state_.torch_at_s = options.torch_at_s;
    }

    int Run() {
        Start(&range_, &state_.range_problem);
        Start(&als_, &state_.als_problem);
        if (!range_.enabled && !als_.enabled) {
            err_->WriteLine("error: neither sensor could be used: range " + state_.range_problem +
                            ", light " + state_.als_problem);
            Stop();
            return 1;
        }
        int status = Loop();
        Stop();
        return status;
    }

  private:
    void Start(Sensor* sensor, std::string* problem) {
        int32_t result = 0;
        ndk::ScopedAStatus status = service_->Open(sensor->mode, &result);
        if (!status.isOk()) {
            *problem = DescribeStatus(status);
            return;
        }
        if (result < 0) {
            *problem = "not available: open -> " + DescribeResult(result);
            return;
        }
        sensor->handle = result;
        sensor->open = true;
        status = service_->Enable(sensor->handle, options_.period_ms, &result);
        if (!status.isOk() || result != 0) {
            *problem = "enable failed -> " +
                       (status.isOk() ? DescribeResult(result) : DescribeStatus(status));
            return;
        }
        sensor->enabled = true;
    }

    void Stop() {
        if (!connection_.IsAlive()) return;
        for (Sensor* sensor : {&range_, &als_}) {
            if (sensor->enabled) service_->Disable(sensor->handle);
            if (sensor->open) service_->Close(sensor->handle);
        }
        if (state_.torch_on) service_->SetTorchLightState(0);
    }

    // True when a new event was taken.
    bool Poll(const Sensor& sensor, Event* event) {
        if (!sensor.enabled) return false;
        int32_t result = 0;
        ndk::ScopedAStatus status = service_->PollOnce(sensor.handle, event, &result);
        return status.isOk() && result == 0;
    }

    int Loop() {
        auto start = steady_clock::now();
        double next_draw = 0;
        double refresh = tty_ ? kTerminalRefreshS : kPlainRefreshS;
        while (!StopSignal::Requested()) {
            if (!connection_.IsAlive()) {
                err_->WriteLine("error: vyrservice died");
                return 1;
            }
            state_.elapsed_s = std::chrono::duration<double>(steady_clock::now() - start).count();
            Event event{};
            if (Poll(range_, &event)) {
                state_.range = DecodeRange(event);
                ++state_.range_events;
            }
            if (Poll(als_, &event)) {
                state_.als = DecodeAls(event);
                ++state_.als_events;
            }
            if (options_.torch_at_s && !state_.torch_on &&
                state_.elapsed_s >= *options_.torch_at_s) {
                service_->SetTorchLightState(1);
                state_.torch_on = true;
                if (!tty_) out_->WriteLine("torch switched on (vyrctl torch 1)");
            }
            bool finished = state_.elapsed_s >= options_.seconds;
            if (state_.elapsed_s >= next_draw || finished) {
                Draw();
                next_draw += refresh;
            }
            if (finished) break;
            StopSignal::SleepFor(kPollInterval);
        }
        return 0;
    }

    void Draw() {
        if (!tty_) {
            out_->WriteLine(DemoScreen::PlainLine(state_));
            return;
        }
        std::vector<std::string> lines = DemoScreen::Panel(state_);
        std::string frame;
        // Move back over the previous frame and overwrite it line by line.
        if (drawn_lines_ > 0) frame += "\033[" + std::to_string(drawn_lines_) + "A";
        for (const std::string& line : lines) frame += "\r\033[K" + line + "\n";
        for (size_t i = lines.size(); i < drawn_lines_; ++i) frame += "\r\033[K\n";
        drawn_lines_ = std::max(drawn_lines_, lines.size());
        out_->Write(frame);
    }

    const Connection& connection_;
    std::shared_ptr<IVYRService> service_;
    const DemoViewOptions& options_;
    LineWriter* out_;
    LineWriter* err_;
    const bool tty_;
    Sensor range_{kModeRange};
    Sensor als_{kModeAls};
    DemoState state_;
    size_t drawn_lines_ = 0;
};

}  // namespace

int RunDemoView(const Connection& connection, const DemoViewOptions& options, LineWriter* out,
                LineWriter* err) {
    return DemoView(connection, options, out, err).Run();
}

}  // namespace vyrctl
