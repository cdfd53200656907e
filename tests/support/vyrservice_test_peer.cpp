// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "vyrservice_test_peer.h"

#include <mutex>

#include "sensor_modes.h"

namespace android {
namespace vyr {
namespace binder {

VYRServiceTestPeer::ModeBlockSnapshot VYRServiceTestPeer::SnapshotModeBlock(VYRService& service,
                                                                            size_t index) {
    // The lock of the worker that changes the block: the range worker owns the range block.
    std::lock_guard<std::mutex> lock(
        service.sensor_locks_[index == static_cast<size_t>(service.range_params_index_)
                                  ? kRangeSensorType
                                  : kAlsSensorType]);
    ServiceModeParams& params = service.mode_params_.at(index);
    return ModeBlockSnapshot{params.running.load(), params.mode.load(), params.enable_count,
                             params.active_period.load(), params.periods};
}

uint64_t VYRServiceTestPeer::SamplesStored(VYRService& service, size_t index) {
    return service.mode_params_.at(index).dump.samples.load();
}

void VYRServiceTestPeer::PushWorkItem(VYRService& service, const WorkItem& item) {
    service.QueueForMode(item.mode).PushAndSignal(item);
}

void VYRServiceTestPeer::SetOnlyClientProcess(VYRService& service, int32_t handle, pid_t pid) {
    ApiLockGuard lock(service.api_lock_, std::chrono::seconds(10));
    ClientEntry& entry = *service.clients_.at(handle);
    entry.users.processes.clear();
    entry.users.unwatched = false;
    service.client_processes_.NoteProcess(&entry.users, pid);
}

std::shared_ptr<ClientEntry> VYRServiceTestPeer::Entry(VYRService& service, int32_t handle) {
    ApiLockGuard lock(service.api_lock_, std::chrono::seconds(10));
    return service.clients_.at(handle);
}

bool VYRServiceTestPeer::HasTakenSample(VYRService& service, size_t index, int32_t handle) {
    ServiceModeParams& params = service.mode_params_.at(index);
    std::lock_guard<std::mutex> lock(params.data_mutex);
    return params.polled_handles.count(handle) != 0;
}

void VYRServiceTestPeer::DeliverBinderDeath(VYRService& service, AIBinder* binder) {
    service.HandleBinderDied(binder);
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
