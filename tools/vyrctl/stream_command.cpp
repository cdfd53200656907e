#include "stream_command.h"

#include <algorithm>

#include "call_check.h"
#include "event_format.h"
#include "event_queue.h"
#include "forwarding_callback.h"
#include "result_text.h"
#include "stop_signal.h"

namespace vyrctl {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

namespace {

constexpr milliseconds kWaitSlice{50};

class Stream {
  public:
    Stream(const Connection& connection, const StreamOptions& options, LineWriter* out,
           LineWriter* err)
        : connection_(connection),
          service_(connection.service()),
          options_(options),
          out_(out),
          err_(err) {}

    int Run() {
        std::string what = std::string("open ") + ModeName(options_.mode);
        int32_t result = 0;
        // Each call runs before its result is read: argument order is unspecified.
        ndk::ScopedAStatus status = service_->Open(options_.mode, &result);
        if (!CheckCall(status, result, what, err_)) return 1;
        handle_ = result;
        int exit_status = Setup() ? Loop() : 1;
        Teardown();
        return exit_status;
    }

  private:
    bool Setup() {
        int32_t result = 0;
        if (options_.low_power) {
            // A refusal (range handles) is worth a warning, not the end of the stream.
            ndk::ScopedAStatus status = service_->EnableLowPower(handle_, true, &result);
            if (status.isOk() && result != 0) {
                err_->WriteLine("warning: lowpower -> " + DescribeResult(result) +
                                " (only the light sensor has a low-power mode); going on without");
            } else if (!status.isOk()) {
                err_->WriteLine("warning: lowpower: " + DescribeStatus(status));
            }
        }
        if (options_.use_callback) {
            Connection::StartThreadPool();
            EventQueue* queue = &queue_;
            callback_ = ndk::SharedRefBase::make<ForwardingCallback>(
                [queue](const Event& event) { queue->Push(event); });
            ndk::ScopedAStatus status = service_->SetCallback(handle_, callback_, &result);
            if (!CheckCall(status, result, "callback", err_)) {
                return false;
            }
        }
        ndk::ScopedAStatus status = service_->Enable(handle_, options_.period_ms, &result);
        if (!CheckCall(status, result, "enable", err_)) {
            return false;
        }
        enabled_ = true;
        err_->WriteLine(std::string("streaming ") + ModeName(options_.mode) + " (handle " +
                        std::to_string(handle_) + ", every " + std::to_string(options_.period_ms) +
                        " ms, " + (options_.use_callback ? "callback" : "poll") +
                        "); Ctrl-C to stop");
        return true;
    }

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
            if (!connection_.IsAlive()) {
                err_->WriteLine("error: vyrservice died");
                dead_ = true;
                return 1;
            }
            if (options_.use_callback) {
                if (std::optional<Event> event = queue_.Pop(kWaitSlice)) Print(*event);
                continue;
            }
            Event event{};
            int32_t result = 0;
            ndk::ScopedAStatus status = service_->PollOnce(handle_, &event, &result);
            if (!status.isOk()) {
                err_->WriteLine("error: poll: " + DescribeStatus(status));
                return 1;
            }
            if (result == 0) {
                Print(event);
            } else if (result != -61) {
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

    void Print(const Event& event) {
        if (options_.count && printed_ >= *options_.count) return;
        ++printed_;
        out_->WriteLine(options_.json ? FormatEventJson(options_.mode, handle_, event)
                                      : FormatEventReadable(options_.mode, event));
    }

    void Teardown() {
        if (dead_) return;
        if (enabled_) service_->Disable(handle_);
        service_->Close(handle_);
        err_->WriteLine("stopped after " + std::to_string(printed_) + " events; handle " +
                        std::to_string(handle_) + " disabled and closed");
    }

    const Connection& connection_;
    std::shared_ptr<IVYRService> service_;
    const StreamOptions& options_;
    LineWriter* out_;
    LineWriter* err_;
    int32_t handle_ = 0;
    bool enabled_ = false;
    bool dead_ = false;
    int64_t printed_ = 0;
    EventQueue queue_;
    std::shared_ptr<ForwardingCallback> callback_;
};

}  // namespace

int RunStream(const Connection& connection, const StreamOptions& options, LineWriter* out,
              LineWriter* err) {
    return Stream(connection, options, out, err).Run();
}

}  // namespace vyrctl
