// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "ring_command.h"

#include <vyr/sample_ring_reader.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <memory>
#include <optional>
#include <string>

#include "boot_clock.h"
#include "call_check.h"
#include "event_format.h"
#include "stop_signal.h"

namespace vyrctl {

using std::chrono::steady_clock;
using vyr::RingSample;
using vyr::SampleRingReader;

namespace {

// The longest sleep on the ring between two looks at the stop flag, the end and the service: a
// signal that lands just before the sleep is seen this much later at most.
constexpr std::chrono::milliseconds kWaitSlice{100};

class RingReading {
  public:
    RingReading(const Connection& connection, const RingOptions& options, LineWriter* out,
                LineWriter* err)
        : service_(*connection.service()),
          connection_(connection),
          options_(options),
          out_(out),
          err_(err) {}

    int Run() {
        // The service's death notice arrives on the pool.
        Connection::StartThreadPool();
        ndk::ScopedAStatus status = service_.Open(options_.mode, &handle_);
        if (!CheckCall(status, handle_, std::string("open ") + ModeName(options_.mode), err_)) {
            return 1;
        }
        const int exit_status = Enable() ? Read() : 1;
        Release();
        return exit_status;
    }

  private:
    bool Enable() {
        ndk::ScopedFileDescriptor ring;
        int32_t result = 0;
        ndk::ScopedAStatus status = service_.EnableRing(handle_, options_.period_ms, &ring, &result);
        if (!CheckCall(status, result, "enable ring", err_)) return false;
        enabled_ = true;
        std::string error;
        reader_ = SampleRingReader::Map(std::move(ring), &error);
        if (reader_ == nullptr) {
            err_->WriteLine("error: cannot read the ring: " + error);
            return false;
        }
        return true;
    }

    int Read() {
        std::optional<steady_clock::time_point> end;
        if (options_.seconds) {
            end = steady_clock::now() + std::chrono::duration_cast<steady_clock::duration>(
                                            std::chrono::duration<double>(*options_.seconds));
        }
        // Samples already in the ring are older than the command: it starts after them.
        uint64_t seq = reader_->LastSeq();
        err_->WriteLine(std::string("reading the ") + ModeName(options_.mode) + " ring (handle " +
                        std::to_string(handle_) + ", every " + std::to_string(options_.period_ms) +
                        " ms, " + std::to_string(reader_->capacity()) + " records, after seq " +
                        std::to_string(seq) + "); Ctrl-C to stop");
        while (!StopSignal::Requested()) {
            const steady_clock::time_point now = steady_clock::now();
            if (end && now >= *end) break;
            if (!connection_.IsAlive()) {
                err_->WriteLine("error: vyrservice died");
                return 1;
            }
            steady_clock::time_point deadline = now + kWaitSlice;
            if (end) deadline = std::min(deadline, *end);
            RingSample sample;
            const SampleRingReader::WaitResult result = reader_->WaitNewer(seq, deadline, &sample);
            if (result == SampleRingReader::WaitResult::kFailed) {
                err_->WriteLine(std::string("error: waiting on the ring: ") + strerror(errno));
                return 1;
            }
            if (result != SampleRingReader::WaitResult::kOk) continue;
            // Taken at once: the age printed is the sample's when this reader got it.
            const int64_t received_boottime_ns = BootTimeNs();
            if (sample.seq > seq + 1) {
                err_->WriteLine("gap: " + std::to_string(sample.seq - seq - 1) +
                                " samples overwritten before they were read (seq " +
                                std::to_string(seq + 1) + " to " + std::to_string(sample.seq - 1) +
                                ")");
            }
            seq = sample.seq;
            Print(sample, received_boottime_ns);
        }
        return 0;
    }

    void Print(const RingSample& sample, int64_t received_boottime_ns) {
        ++printed_;
        const aidl::android::vyr::Event event = sample.ToEvent();
        out_->WriteLine(
            options_.json
                ? FormatEventJson(options_.mode, handle_, event, received_boottime_ns)
                : FormatRingSampleReadable(options_.mode, sample.seq, event, received_boottime_ns));
    }

    // A dead service released the handle itself.
    void Release() {
        if (!connection_.IsAlive()) return;
        if (enabled_) service_.Disable(handle_);
        service_.Close(handle_);
        err_->WriteLine("stopped after " + std::to_string(printed_) + " samples; handle " +
                        std::to_string(handle_) + (enabled_ ? " disabled and closed" : " closed"));
    }

    aidl::android::vyr::IVYRService& service_;
    const Connection& connection_;
    const RingOptions& options_;
    LineWriter* out_;
    LineWriter* err_;
    int32_t handle_ = 0;
    bool enabled_ = false;
    std::unique_ptr<SampleRingReader> reader_;
    int64_t printed_ = 0;
};

}  // namespace

int RunRing(const Connection& connection, const RingOptions& options, LineWriter* out,
            LineWriter* err) {
    return RingReading(connection, options, out, err).Run();
}

}  // namespace vyrctl
