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

#include "batch_sender.h"
#include "event_conversion.h"
#include "sample_queue.h"
#include "sensor_modes.h"

namespace android {
namespace vyr {
namespace binder {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;

namespace {

// Replaces `event` with the sample of `mode`, as PollOnce returns it.
void ConvertSample(int32_t mode, const QueuedSample& sample, Event* event) {
    Event local{};
    if (mode == kRangeMode) {
        ConvertRangingData(sample.range, &local);
    } else {
        ConvertAlsResult(sample.als, &local);
    }
    event->status = local.status;
    event->timestamp = local.timestamp;
    event->value0 = local.value0;
    event->value1 = local.value1;
    event->data = std::move(local.data);
    event->boottime = sample.boottime_ns;
}

}  // namespace

EventDelivery::EventDelivery(ParamsForMode params_for_mode)
    : params_for_mode_(std::move(params_for_mode)) {}

bool EventDelivery::PollInternal(int32_t handle, int32_t mode, Event* event) {
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
    QueuedSample sample;
    {
        std::lock_guard<std::mutex> lock(params->data_mutex);
        params->polled_handles.insert(handle);
        if (mode == kRangeMode) {
            sample.range = params->range_data;
        } else {
            sample.als = params->als_data;
        }
        sample.boottime_ns = params->feed.boottime_ns;
    }
    // Converted outside the lock so that the processing loop waits for one copy at most.
    if ((mode == kRangeMode ? sample.range.valid : sample.als.valid) == 0) {
        ALOGW("%s, invalid data", __func__);
        return false;
    }
    ConvertSample(mode, sample, event);
    return true;
}

void EventDelivery::Start(int32_t handle, const std::shared_ptr<ClientEntry>& entry) {
    const uint64_t generation = ++entry->delivery.generation;
    entry->notify_cv = std::make_unique<std::condition_variable>();
    entry->notify_mutex = std::make_unique<std::mutex>();
    entry->delivery.sample_queue.reset();
    if (entry->delivery.on_sample && entry->callback) {
        entry->delivery.sample_queue =
            std::make_shared<SampleQueue>(handle, entry->period, entry->counters.samples_dropped);
    }
    entry->state = kClientEnabled;
    if (!entry->callback) {
        return;
    }
    if (entry->delivery.sample_queue) {
        // Subscribed before the thread starts: no sample stored after Enable returned is missed.
        Subscribe(entry->mode, entry->delivery.sample_queue);
        OnSampleClient client{handle,
                              entry->mode,
                              entry->period,
                              entry->delivery.max_report_latency,
                              generation,
                              entry->callback,
                              entry->delivery.sample_queue};
        entry->notify_thread = std::make_unique<std::thread>(&EventDelivery::SampleLoop, this,
                                                             entry, std::move(client));
    } else {
        entry->notify_thread = std::make_unique<std::thread>(&EventDelivery::NotifyLoop, this,
                                                             handle, entry, generation);
    }
}

void EventDelivery::SampleStored(ServiceModeParams& params) {
    // Held by the caller; GCC cannot parse an annotation that names an argument's member.
    android::base::ScopedLockAssertion held(params.data_mutex);
    if (params.feed.sample_queues.empty()) return;
    const int32_t mode = params.mode;
    QueuedSample sample;
    if (mode == kRangeMode) {
        if (params.range_data.valid == 0) return;
        sample.range = params.range_data;
    } else {
        if (params.als_data.valid == 0) return;
        sample.als = params.als_data;
    }
    sample.boottime_ns = params.feed.boottime_ns;
    const int32_t active_period = params.active_period;
    const auto now = std::chrono::steady_clock::now();
    for (const std::shared_ptr<SampleQueue>& queue : params.feed.sample_queues) {
        if (queue->Offer(sample, active_period, now)) params.polled_handles.insert(queue->handle());
    }
}

void EventDelivery::Subscribe(int32_t mode, const std::shared_ptr<SampleQueue>& queue) {
    ServiceModeParams& params = params_for_mode_(mode);
    std::lock_guard<std::mutex> lock(params.data_mutex);
    params.feed.sample_queues.push_back(queue);
}

void EventDelivery::Unsubscribe(int32_t mode, const std::shared_ptr<SampleQueue>& queue) {
    ServiceModeParams& params = params_for_mode_(mode);
    std::lock_guard<std::mutex> lock(params.data_mutex);
    auto& queues = params.feed.sample_queues;
    queues.erase(std::remove(queues.begin(), queues.end(), queue), queues.end());
}

void EventDelivery::NotifyLoop(int32_t handle, std::shared_ptr<ClientEntry> entry,
                               uint64_t generation) {
    if (entry == nullptr) {
        return;
    }
    // False once the client was disabled, also when a nested Enable has started a successor.
    const auto enabled = [&entry, generation] {
        return entry->state == kClientEnabled && entry->delivery.generation == generation;
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
            ++entry->counters.events_delivered;
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

void EventDelivery::SampleLoop(std::shared_ptr<ClientEntry> entry, OnSampleClient client) {
    const uint64_t generation = client.generation;
    const auto enabled = [&entry, generation] {
        return entry->state == kClientEnabled && entry->delivery.generation == generation;
    };
    const int32_t handle = client.handle;
    const std::chrono::milliseconds latency(client.max_report_latency);
    IEventCallback& callback = *client.callback;
    SampleQueue& queue = *client.queue;

    std::vector<Event> held;
    size_t held_bytes = 0;
    std::chrono::steady_clock::time_point held_since;
    uint64_t flushes_due = 0;
    bool dead = false;
    const auto hand_over = [&] {
        if (held.empty()) return;
        const BatchResult result = SendBatch(callback, held);
        entry->counters.events_delivered += result.delivered;
        if (result.dropped != 0) {
            queue.CountDropped(result.dropped);
            ALOGE("OnEventBatch handle %d: %zu events refused even one by one are dropped", handle,
                  result.dropped);
        }
        dead = result.dead;
        held.clear();
        held_bytes = 0;
    };
    while (!dead) {
        std::optional<std::chrono::steady_clock::time_point> deadline;
        if (!held.empty()) deadline = held_since + latency;
        SampleQueue::Taken taken = queue.Take(deadline);
        const bool stopping = taken.stopped || !enabled();
        flushes_due += taken.flushes;
        // What a stopped client held goes with it, unless a Flush promised to deliver it.
        if (stopping && flushes_due == 0) break;
        for (const QueuedSample& sample : taken.samples) {
            Event event;
            ConvertSample(client.mode, sample, &event);
            if (latency.count() == 0) {
                ATRACE_BEGIN("vyr deliver");
                dead = callback.OnEvent(event).getStatus() == STATUS_DEAD_OBJECT;
                ATRACE_END();
                if (dead) break;
                ++entry->counters.events_delivered;
                continue;
            }
            const size_t bytes = BatchBytes(event);
            if (kBatchHeaderBytes + held_bytes + bytes > kBatchBudgetBytes) hand_over();
            if (held.empty()) held_since = std::chrono::steady_clock::now();
            held.push_back(std::move(event));
            held_bytes += bytes;
        }
        if (flushes_due != 0 || stopping ||
            (!held.empty() && std::chrono::steady_clock::now() >= held_since + latency)) {
            hand_over();
        }
        // Each Flush gets its own completion, after everything queued before it.
        for (; flushes_due != 0 && !dead; --flushes_due) {
            dead = callback.OnFlushComplete(handle).getStatus() == STATUS_DEAD_OBJECT;
        }
        if (stopping) break;
    }
    Unsubscribe(client.mode, client.queue);
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
