// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/Event.h>
#include <android-base/thread_annotations.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <vector>

#include "client_entry.h"
#include "service_mode_params.h"

namespace android {
namespace vyr {
namespace binder {

// Hands the samples of the mode blocks to clients, each sample at most once per handle: by poll,
// by the version 1 timer loop (a client's own period), and by the version 2 delivery on sample
// (every k-th sample queued by the processing loop, optionally held for a report latency).
class EventDelivery {
  public:
    using ParamsForMode = std::function<ServiceModeParams&(int32_t mode)>;

    explicit EventDelivery(ParamsForMode params_for_mode);

    // Fills `event` with the latest sample of `mode` if `handle` has not taken it yet.
    bool PollInternal(int32_t handle, int32_t mode, aidl::android::vyr::Event* event);

    // Marks an entry, already given its period (and latency and `on_sample`), enabled and starts
    // its delivery thread when it has a callback. The generation is raised and the condition
    // variable and mutex are replaced before the state is published: a thread let go by a nested
    // Disable that sees the client enabled again then also sees a generation that is not its own,
    // and never touches the objects being replaced.
    void Start(int32_t handle, const std::shared_ptr<ClientEntry>& entry);

    // Called by the processing loop as it stores a sample, with the block's data_mutex held:
    // queues a valid sample for each client enabled on sample whose stride takes it, which has
    // then taken it (a poll of that handle does not return it again).
    static void SampleStored(ServiceModeParams& params);

  private:
    // Version 1: polls once per client period.
    void NotifyLoop(int32_t handle, std::shared_ptr<ClientEntry> entry, uint64_t generation);
    // What a version 2 delivery thread is started with, copied from its entry under the API lock:
    // once the thread is stopped, the lock is released before it is joined, and the entry may be
    // set up anew meanwhile.
    struct OnSampleClient {
        int32_t handle = 0;
        int32_t mode = 0;
        int32_t period = 0;
        int32_t max_report_latency = 0;
        uint64_t generation = 0;
        std::shared_ptr<aidl::android::vyr::IEventCallback> callback;
        std::shared_ptr<SampleQueue> queue;
    };
    // Version 2: drains the client's queue; no timer but the report latency's. Held events are
    // handed over when the latency has passed, when they reach kBatchBudgetBytes, and at a Flush.
    // Once stopped it ends at once, unless a Flush answered 0 is still due: then it delivers what
    // was queued and held, and completes each such Flush, first.
    void SampleLoop(std::shared_ptr<ClientEntry> entry, OnSampleClient client);
    void Subscribe(int32_t mode, const std::shared_ptr<SampleQueue>& queue);
    void Unsubscribe(int32_t mode, const std::shared_ptr<SampleQueue>& queue);

    const ParamsForMode params_for_mode_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
