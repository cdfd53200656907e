// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// What tests may reach inside a VYRService that no binder method shows: a consistent copy of a
// mode block's scheduling state, a way to queue work items that no client sequence makes, and
// client deaths as another process would cause them.

#include <android/binder_ibinder.h>
#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <unordered_map>

#include "vyrservice.h"
#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

class VYRServiceTestPeer {
  public:
    struct ModeBlockSnapshot {
        bool running;
        int32_t mode;
        int32_t enable_count;
        int32_t active_period;
        std::unordered_map<int32_t, int32_t> periods;
    };

    // Waits for the block's worker to finish the item it is applying.
    static ModeBlockSnapshot SnapshotModeBlock(VYRService& service, size_t index);
    // Queues an item for the worker of its mode, as the binder methods and the display monitor
    // do.
    static void PushWorkItem(VYRService& service, const WorkItem& item);
    // Makes `pid` the only process that uses `handle`, as if that process had opened it and
    // made every call on it: its end releases the handle.
    static void SetOnlyClientProcess(VYRService& service, int32_t handle, pid_t pid);
    // The entry of an open handle, for a test that watches its state from another thread.
    static std::shared_ptr<ClientEntry> Entry(VYRService& service, int32_t handle);
    // How many samples the block's processing loop has stored; takes no lock.
    static uint64_t SamplesStored(VYRService& service, size_t index);
    // Whether `handle` has taken the sample that the block holds now.
    static bool HasTakenSample(VYRService& service, size_t index, int32_t handle);
    // What a death notice for the callback binder `binder` does.
    static void DeliverBinderDeath(VYRService& service, AIBinder* binder);
};

}  // namespace binder
}  // namespace vyr
}  // namespace android

namespace vyr_test {
using ServicePeer = android::vyr::binder::VYRServiceTestPeer;
using ModeBlockSnapshot = android::vyr::binder::VYRServiceTestPeer::ModeBlockSnapshot;
}  // namespace vyr_test
