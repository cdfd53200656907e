// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#define LOG_TAG "vyrservice"
#define ATRACE_TAG ATRACE_TAG_CAMERA

#include "event_delivery.h"

#include <aidl/android/vyr/IEventCallback.h>
#include <cutils/trace.h>
#include <log/log.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include "event_conversion.h"
#include "sample_signal.h"
#include "sensor_modes.h"

namespace android {
namespace vyr {
namespace binder {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;

EventDelivery::EventDelivery(ParamsForMode params_for_mode)
    : params_for_mode_(std::move(params_for_mode)) {}

bool EventDelivery::PollInternal(int32_t handle, int32_t mode, Event* event) {
    Event local{};
    if (mode != kRangeMode && mode != kAlsMode) {
        ALOGE("%s, invalid mode", __func__);
        return false;
    }
    ServiceModeParams* params = &params_for_mode_(mode);
    {
        std::lock_guard<std::mutex> lock(params->data_mutex);
        if (params->polled_handles.count(handle) != 0) {
            return false;
        }
    }
    // A sample published between the test above and this section is the one taken.
    ALSResult als_data{};
    MultiRangingData range_data{};
    int64_t boottime_ns = 0;
    {
        std::lock_guard<std::mutex> lock(params->data_mutex);
        params->polled_handles.insert(handle);
        if (mode == kRangeMode) {
            range_data = params->range_data;
        } else {
            als_data = params->als_data;
        }
        boottime_ns = params->boottime_ns;
    }
    // Converted outside the lock so that the processing loop waits for one copy at most.
    if (mode == kRangeMode) {
        if (range_data.valid == 0) {
            ALOGW("%s, invalid data", __func__);
            return false;
        }
        ConvertRangingData(range_data, &local);
    } else {
        if (als_data.valid == 0) {
            ALOGW("%s, invalid data", __func__);
            return false;
        }
        ConvertAlsResult(als_data, &local);
    }
    event->status = local.status;
    event->timestamp = local.timestamp;
    event->value0 = local.value0;
    event->value1 = local.value1;
    event->data = std::move(local.data);
    event->boottime = boottime_ns;
    return true;
}

void EventDelivery::Start(int32_t handle, const std::shared_ptr<ClientEntry>& entry) {
    const uint64_t generation = ++entry->notify_generation;
    entry->notify_cv = std::make_unique<std::condition_variable>();
    entry->notify_mutex = std::make_unique<std::mutex>();
    entry->sample_signal.reset();
    if (entry->on_sample && entry->callback) {
        entry->sample_signal = std::make_shared<SampleSignal>();
    }
    entry->state = kClientEnabled;
    if (!entry->callback) {
        return;
    }
    if (entry->sample_signal) {
        // Subscribed before the thread starts: no sample stored after Enable returned is missed.
        Subscribe(entry->mode, entry->sample_signal);
        OnSampleClient client{
            handle,     entry->mode,     entry->period,       entry->max_report_latency,
            generation, entry->callback, entry->sample_signal};
        entry->notify_thread = std::make_unique<std::thread>(&EventDelivery::SampleLoop, this,
                                                             entry, std::move(client));
    } else {
        entry->notify_thread = std::make_unique<std::thread>(&EventDelivery::NotifyLoop, this,
                                                             handle, entry, generation);
    }
}

void EventDelivery::SampleStored(const std::vector<std::shared_ptr<SampleSignal>>& signals) {
    for (const std::shared_ptr<SampleSignal>& signal : signals) {
        signal->Publish();
    }
}

void EventDelivery::Subscribe(int32_t mode, const std::shared_ptr<SampleSignal>& signal) {
    ServiceModeParams& params = params_for_mode_(mode);
    std::lock_guard<std::mutex> lock(params.data_mutex);
    params.sample_signals.push_back(signal);
}

void EventDelivery::Unsubscribe(int32_t mode, const std::shared_ptr<SampleSignal>& signal) {
    ServiceModeParams& params = params_for_mode_(mode);
    std::lock_guard<std::mutex> lock(params.data_mutex);
    auto& signals = params.sample_signals;
    signals.erase(std::remove(signals.begin(), signals.end(), signal), signals.end());
}

void EventDelivery::NotifyLoop(int32_t handle, std::shared_ptr<ClientEntry> entry,
                               uint64_t generation) {
    if (entry == nullptr) {
        return;
    }
    // False once the client was disabled, also when a nested Enable has started a successor.
    const auto enabled = [&entry, generation] {
        return entry->state == kClientEnabled && entry->notify_generation == generation;
    };
    Event event{};
    while (enabled() && entry->callback) {
        const bool ok = PollInternal(handle, entry->mode, &event);
        if (!enabled()) {
            break;
        }
        if (ok) {
            // Its own reference: OnEvent may call SetCallback or Close, which drop the entry's.
            const std::shared_ptr<IEventCallback> callback = entry->callback;
            // A failed delivery is the death handler's business, not this loop's.
            ATRACE_BEGIN("vyr deliver");
            callback->OnEvent(event);
            ATRACE_END();
            ++entry->events_delivered;
            if (!enabled()) {
                break;
            }
        }
        const auto deadline = std::chrono::steady_clock::now() +
                              std::chrono::nanoseconds(int64_t{entry->period} * 1000000);
        std::unique_lock<std::mutex> lock(*entry->notify_mutex);
        while (enabled()) {
            const auto left = deadline - std::chrono::steady_clock::now();
            if (left >= std::chrono::nanoseconds(1)) {
                entry->notify_cv->wait_for(lock, left);
            }
            if (std::chrono::steady_clock::now() >= deadline) {
                break;
            }
        }
    }
}

namespace {

// Every k-th sample for a client slower than the mode: k = max(1, round(period / active)).
uint64_t SampleStride(int32_t client_period, int32_t active_period) {
    if (active_period < 1) return 1;
    const double ratio = static_cast<double>(client_period) / active_period;
    return std::max<uint64_t>(1, static_cast<uint64_t>(std::llround(ratio)));
}

}  // namespace

void EventDelivery::SampleLoop(std::shared_ptr<ClientEntry> entry, OnSampleClient client) {
    const uint64_t generation = client.generation;
    const auto enabled = [&entry, generation] {
        return entry->state == kClientEnabled && entry->notify_generation == generation;
    };
    const int32_t handle = client.handle;
    const int32_t mode = client.mode;
    const int32_t period = client.period;
    const std::chrono::milliseconds latency(client.max_report_latency);
    ServiceModeParams& params = params_for_mode_(mode);
    const std::shared_ptr<IEventCallback>& callback = client.callback;
    SampleSignal* const signal = client.signal.get();

    SampleSignal::Seen seen;
    uint64_t taken_at = 0;
    std::vector<Event> held;
    std::chrono::steady_clock::time_point held_since;
    while (enabled()) {
        std::optional<std::chrono::steady_clock::time_point> deadline;
        if (!held.empty()) deadline = held_since + latency;
        const SampleSignal::Seen now = signal->Wait(seen, deadline);
        if (now.stopped || !enabled()) {
            break;
        }
        // The active period is read at each sample, so a change of it changes k at once.
        if (now.samples != seen.samples &&
            now.samples - taken_at >= SampleStride(period, params.active_period)) {
            Event event{};
            if (PollInternal(handle, mode, &event)) {
                taken_at = now.samples;
                if (latency.count() == 0) {
                    ATRACE_BEGIN("vyr deliver");
                    callback->OnEvent(event);
                    ATRACE_END();
                    ++entry->events_delivered;
                } else {
                    if (held.empty()) held_since = std::chrono::steady_clock::now();
                    held.push_back(std::move(event));
                }
            }
        }
        // Each Flush gets its own completion, also when two came before this thread woke.
        const uint64_t flushes = now.flushes - seen.flushes;
        seen = now;
        if (!held.empty() &&
            (flushes != 0 || std::chrono::steady_clock::now() >= held_since + latency)) {
            ATRACE_BEGIN("vyr deliver batch");
            callback->OnEventBatch(held);
            ATRACE_END();
            entry->events_delivered += held.size();
            held.clear();
        }
        for (uint64_t i = 0; i < flushes && enabled(); ++i) {
            callback->OnFlushComplete(handle);
        }
    }
    Unsubscribe(mode, client.signal);
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
