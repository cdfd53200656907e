// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service's own threads: the two workers that switch the sensors, the processing loop of
// each enabled mode, and the display monitor.

#define LOG_TAG "vyrservice"
#define ATRACE_TAG ATRACE_TAG_CAMERA

#include <android-base/unique_fd.h>
#include <cutils/trace.h>
#include <fcntl.h>
#include <log/log.h>
#include <poll.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <optional>

#include "display_state.h"
#include "ring_feed.h"
#include "sensor_modes.h"
#include "vyrservice.h"

namespace android {
namespace vyr {
namespace binder {
namespace {

constexpr int32_t kMaxRecomputedPeriodMs = 5000;
constexpr int32_t kDisplayPeriodMs = 1000;
// In low-power mode the spectral sensor is powered up again this long before the next sample.
constexpr int32_t kLowPowerWakeMarginMs = 90;

int64_t MillisSince(std::chrono::steady_clock::time_point start) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() -
                                                                 start)
        .count();
}

int64_t BootTimeNs() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return int64_t{now.tv_sec} * 1000000000 + now.tv_nsec;
}

// Absolute system-clock time `left` from now, saturated at the clock's largest time point.
std::chrono::system_clock::time_point SystemDeadline(std::chrono::steady_clock::duration left) {
    const auto now = std::chrono::system_clock::now();
    const auto room = std::chrono::system_clock::time_point::max() - now;
    const auto wanted = std::chrono::ceil<std::chrono::system_clock::duration>(left);
    return wanted >= room ? std::chrono::system_clock::time_point::max() : now + wanted;
}

}  // namespace

// Workers.

void VYRService::StartWorker(unsigned int sensor_type) {
    worker_threads_.emplace(sensor_type, std::thread(&VYRService::WorkLoop, this, sensor_type));
}

void VYRService::WorkLoop(unsigned int sensor_type) {
    WorkQueue& queue = work_queues_[sensor_type];
    std::mutex& sensor_lock = sensor_locks_[sensor_type];
    while (running_) {
        const std::optional<WorkItem> item = queue.WaitAndPop(running_);
        if (!item) {
            return;
        }
        // The queue's mutex is released: a worker never holds it with its sensor lock.
        std::lock_guard<std::mutex> lock(sensor_lock);
        ServiceModeParams& params = ParamsForMode(item->mode);
        ATRACE_BEGIN(item->enable ? "vyr enable work" : "vyr disable work");
        if (item->enable) {
            EnableWork(*item, &params, sensor_type);
        } else {
            DisableWork(*item, &params, sensor_type);
        }
        ATRACE_END();
        TraceModeCounters(params);
        {
            std::lock_guard<std::mutex> shown(params.dump.mutex);
            params.dump.enable_count = params.enable_count;
            params.dump.periods = params.periods;
        }
        queue.CountApplied();
    }
}

void VYRService::EnableWork(const WorkItem& item, ServiceModeParams* params,
                            unsigned int sensor_type) {
    params->mode = item.mode;
    ++params->enable_count;
    params->periods[item.handle] = item.period;
    const int32_t active_period = params->periods.size() == 1
                                      ? item.period
                                      : std::min(params->active_period.load(), item.period);
    params->active_period = active_period;
    ALOGI("%s mode %d, enable count %d, handle:%x sampling/active period %d/%d, sensor type:%d",
          __func__, item.mode, params->enable_count, item.handle, item.period, active_period,
          sensor_type);

    bool started = true;
    if (item.mode == kRangeMode) {
        started = range_sensor_->Init() == 0;
        range_sensor_->Enable(true);
        dump_state_.NoteRangeInitialized(started);
        dump_state_.NoteRangeEnabled(true);
    } else if (item.mode == kAlsMode) {
        if (params->enable_count == 1) {
            als_sensor_->enabled = true;
        }
    }
    params->running = true;
    if (started && !params->process_thread.joinable()) {
        params->process_thread = std::thread(&VYRService::ProcessLoop, this, params);
    }
}

void VYRService::DisableWork(const WorkItem& item, ServiceModeParams* params,
                             unsigned int sensor_type) {
    --params->enable_count;
    params->periods.erase(item.handle);
    if (params->enable_count < 1) {
        if (params->enable_count < 0) {
            ALOGW("%s: mode %d enable count becomes negative (%d)", __func__, item.mode,
                  params->enable_count);
        }
        params->running = false;
        if (item.mode == kRangeMode) {
            range_sensor_->Enable(false);
            dump_state_.NoteRangeEnabled(false);
        } else if (item.mode == kAlsMode) {
            als_sensor_->enabled = false;
        }
        // Taking the mutex once keeps the notification from falling between WaitFor's test of
        // `running` and its wait.
        { std::lock_guard<std::mutex> lock(params->wait_mutex); }
        params->wait_cv.notify_all();
        if (params->process_thread.joinable()) {
            params->process_thread.join();
        }
    } else {
        int32_t active_period = kMaxRecomputedPeriodMs;
        for (const auto& [handle, period] : params->periods) {
            active_period = std::min(active_period, period);
        }
        params->active_period = active_period;
    }
    ALOGI("%s mode %d, enable count %d, handle:%x, active_period:%d, sensor type:%d", __func__,
          item.mode, params->enable_count, item.handle, params->active_period.load(), sensor_type);
    if (item.mode == kRangeMode) {
        range_sensor_->Uninit();
        dump_state_.NoteRangeInitialized(false);
    }
}

void VYRService::TraceModeCounters(const ServiceModeParams& params) {
    // One counter track per mode, named as the README lists them.
    if (params.mode == kRangeMode) {
        ATRACE_INT("vyr mode 3 enable count", params.enable_count);
        ATRACE_INT("vyr mode 3 active period ms", params.active_period);
    } else if (params.mode == kAlsMode) {
        ATRACE_INT("vyr mode 1 enable count", params.enable_count);
        ATRACE_INT("vyr mode 1 active period ms", params.active_period);
    }
}

// Sampling.

void VYRService::ProcessLoop(ServiceModeParams* params) {
    ALSResult reading{};
    MultiRangingData data{};
    do {
        const auto start = std::chrono::steady_clock::now();
        int32_t mode = params->mode;
        const int32_t period = params->active_period;
        if (mode == kAlsMode || mode == kRangeMode) {
            if (mode == kAlsMode) {
                ATRACE_BEGIN("vyr als read");
                als_sensor_->ReadSingleShot(&reading, kAlsReadWait, kAlsIntegrationMs);
            } else {
                ATRACE_BEGIN("vyr range read");
                range_sensor_->Process(kRangeProcessMode, &data);
            }
            // As the library returns the reading: the time a camera frame can be matched to.
            const int64_t boottime_ns = BootTimeNs();
            ATRACE_END();
            // A reading taken across a disable is stale for whoever enables next.
            if (!params->running) {
                return;
            }
            std::lock_guard<std::mutex> lock(params->data_mutex);
            params->feed.boottime_ns = boottime_ns;
            if (mode == kAlsMode) {
                params->als_data = reading;
            } else {
                params->range_data = data;
            }
            params->polled_handles.clear();
            EventDelivery::SampleStored(*params);
            FeedRing(*params);
            ++params->dump.samples;
            if ((mode == kAlsMode ? reading.valid : data.valid) == 0)
                ++params->dump.invalid_samples;
            params->dump.last_sample_ns = std::chrono::duration_cast<std::chrono::nanoseconds>(
                                              std::chrono::steady_clock::now().time_since_epoch())
                                              .count();
        }

        const int64_t remaining = period - MillisSince(start);
        mode = params->mode;
        if (mode != kRangeMode && remaining > kLowPowerWakeMarginMs && mode == kAlsMode &&
            low_power_ && num_clients_ == 1) {
            const auto off_start = std::chrono::steady_clock::now();
            als_sensor_->Disable();
            WaitFor(params, static_cast<int32_t>(remaining - kLowPowerWakeMarginMs));
            const int64_t rest = remaining - MillisSince(off_start);
            if (rest >= 1) {
                WaitFor(params, static_cast<int32_t>(rest));
            }
        } else if (remaining >= 1) {
            WaitFor(params, static_cast<int32_t>(remaining));
        }
    } while (params->running.load(std::memory_order_acquire));
}

void VYRService::WaitFor(ServiceModeParams* params, int32_t ms) {
    std::unique_lock<std::mutex> lock(params->wait_mutex);
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(ms);
    while (true) {
        if (!params->running.load(std::memory_order_acquire)) {
            return;
        }
        const auto now = std::chrono::steady_clock::now();
        if (now < deadline) {
            params->wait_cv.wait_until(lock, SystemDeadline(deadline - now));
        }
        if (std::chrono::steady_clock::now() >= deadline) {
            return;
        }
    }
}

// Display state.

void VYRService::MonitorDisplayStatus(const std::string& path) {
    base::unique_fd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    if (fd.get() < 0) {
        ALOGE("vyrservice cannot open the display state file for reading.: %s", strerror(errno));
        dump_state_.NoteDisplay("ended: cannot open " + path + ": " + strerror(errno), "");
        return;
    }
    if (als_sensor_ == nullptr) {
        ALOGE("%s: ALS sensor unavailable", __func__);
        dump_state_.NoteDisplay("ended: no light sensor", "");
        return;
    }
    dump_state_.NoteDisplay("watching " + path, "");
    bool lit = false;
    char buffer[kDisplayStateBufferSize];
    while (running_) {
        // sysfs signals a changed attribute with POLLPRI.
        pollfd pfd{fd.get(), POLLPRI, 0};
        poll(&pfd, 1, -1);
        if ((pfd.revents & POLLPRI) == 0) {
            continue;
        }
        lseek(fd.get(), 0, SEEK_SET);
        const ssize_t count = read(fd.get(), buffer, sizeof(buffer));
        if (count < 0) {
            ALOGE("vyrservice failed to read display state file: %s", strerror(errno));
            dump_state_.NoteDisplay("watching " + path,
                                    std::string("read failed: ") + strerror(errno));
            if (lit) {
                work_queues_[kAlsSensorType].PushAndSignal(
                    WorkItem{false, kAlsMode, display_handle_, 0});
            }
            lit = false;
            continue;
        }
        const DisplayState state = JudgeDisplayState(buffer, static_cast<size_t>(count));
        const bool now_lit = state.lit;
        const std::string& shown = state.shown;
        dump_state_.NoteDisplay("watching " + path, shown);
        if (now_lit != lit) {
            dump_state_.RecordEvent(std::string("display ") + (now_lit ? "lit" : "dark") + ": " +
                                    shown);
        }
        if (now_lit && !lit) {
            ALOGI("Enable sensor for display state: %s", state.text.c_str());
            work_queues_[kAlsSensorType].PushAndSignal(
                WorkItem{true, kAlsMode, display_handle_, kDisplayPeriodMs});
        } else if (!now_lit && lit) {
            ALOGI("Disable sensor for display state: %s", state.text.c_str());
            work_queues_[kAlsSensorType].PushAndSignal(
                WorkItem{false, kAlsMode, display_handle_, 0});
        }
        lit = now_lit;
    }
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
