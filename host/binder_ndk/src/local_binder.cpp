// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "local_binder.h"

#include <android/binder_parcel_utils.h>

#include <utility>

#include "parcel.h"

namespace vyr_binder {
namespace {

std::atomic<uint64_t> g_next_export_id{1};

// Reads and checks the interface token that AIBinder_prepareTransaction wrote.
bool CheckInterfaceToken(const AIBinder_Class* clazz, const AParcel* in) {
    int32_t marker;
    if (AParcel_readInt32(in, &marker) != STATUS_OK || marker != kInterfaceTokenMarker) {
        return false;
    }
    std::string descriptor;
    if (ndk::AParcel_readString(in, &descriptor) != STATUS_OK) return false;
    return descriptor == clazz->descriptor;
}

}  // namespace

LocalBinder::LocalBinder(const AIBinder_Class* clazz, void* user_data)
    : AIBinder(clazz), user_data_(user_data) {}

LocalBinder::~LocalBinder() {
    GetClass()->on_destroy(user_data_);
}

binder_status_t LocalBinder::Transact(transaction_code_t code, AParcel* in, AParcel* out,
                                      binder_flags_t /*flags*/) {
    const AIBinder_Class* clazz = GetClass();
    if (code == kPingTransaction) return STATUS_OK;
    if (code == kInterfaceTransaction) {
        return AParcel_writeString(out, clazz->descriptor.data(),
                                   static_cast<int32_t>(clazz->descriptor.size()));
    }
    if (!IsUserCode(code)) return STATUS_UNKNOWN_TRANSACTION;
    if (clazz->write_header && !CheckInterfaceToken(clazz, in)) return STATUS_BAD_TYPE;
    return clazz->on_transact(this, code, in, out);
}

binder_status_t LocalBinder::Dump(int fd, const char** args, uint32_t num_args) {
    const AIBinder_Class* clazz = GetClass();
    if (clazz->on_dump == nullptr) return STATUS_OK;
    return clazz->on_dump(this, fd, args, num_args);
}

binder_status_t LocalBinder::LinkToDeath(const DeathLink& /*link*/) {
    return STATUS_INVALID_OPERATION;
}

binder_status_t LocalBinder::UnlinkToDeath(const std::shared_ptr<DeathRecipientState>& /*recipient*/,
                                           void* /*cookie*/) {
    return STATUS_NAME_NOT_FOUND;
}

uint64_t LocalBinder::ExportId() {
    uint64_t id = export_id_.load(std::memory_order_acquire);
    if (id != 0) return id;
    uint64_t fresh = g_next_export_id.fetch_add(1, std::memory_order_relaxed);
    if (export_id_.compare_exchange_strong(id, fresh, std::memory_order_acq_rel)) return fresh;
    return id;
}

bool LocalBinder::QueueOneway(std::function<void()> call) {
    std::lock_guard<std::mutex> lock(oneway_mutex_);
    oneway_queue_.push_back(std::move(call));
    if (oneway_running_) return false;
    oneway_running_ = true;
    return true;
}

void LocalBinder::DrainOneway() {
    for (;;) {
        std::function<void()> call;
        {
            std::lock_guard<std::mutex> lock(oneway_mutex_);
            if (oneway_queue_.empty()) {
                oneway_running_ = false;
                return;
            }
            call = std::move(oneway_queue_.front());
            oneway_queue_.pop_front();
        }
        call();
    }
}

}  // namespace vyr_binder
