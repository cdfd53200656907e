// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "transaction_buffer.h"

#include <vyr/binder_host.h>

#include <atomic>
#include <mutex>
#include <utility>

namespace vyr_binder {
namespace {

std::atomic<size_t> g_used{0};
std::atomic<size_t> g_async_used{0};

std::mutex g_held_mutex;
// What VyrBinder_holdTransactionBuffer took.
TransactionBuffer::Charge g_held;
bool g_holding = false;

size_t RoundUp8(size_t bytes) {
    return (bytes + 7) & ~size_t{7};
}

// Adds `bytes` to `counter` unless that passes `limit`.
bool TryAdd(std::atomic<size_t>* counter, size_t bytes, size_t limit) {
    size_t used = counter->load(std::memory_order_relaxed);
    do {
        if (used + bytes > limit) return false;
    } while (!counter->compare_exchange_weak(used, used + bytes, std::memory_order_relaxed));
    return true;
}

}  // namespace

size_t TransactionBuffer::Footprint(size_t data_bytes, size_t objects) {
    // Offsets are 64-bit (binder_size_t) whatever the process.
    const size_t bytes = RoundUp8(data_bytes) + objects * 8;
    return bytes < 8 ? 8 : bytes;
}

TransactionBuffer::Charge::Charge(Charge&& other) noexcept
    : bytes_(std::exchange(other.bytes_, 0)), oneway_(other.oneway_) {}

TransactionBuffer::Charge& TransactionBuffer::Charge::operator=(Charge&& other) noexcept {
    if (this != &other) {
        Release();
        bytes_ = std::exchange(other.bytes_, 0);
        oneway_ = other.oneway_;
    }
    return *this;
}

void TransactionBuffer::Charge::Release() {
    if (bytes_ == 0) return;
    g_used.fetch_sub(bytes_, std::memory_order_relaxed);
    if (oneway_) g_async_used.fetch_sub(bytes_, std::memory_order_relaxed);
    bytes_ = 0;
}

bool TransactionBuffer::Reserve(size_t footprint, bool oneway, Charge* charge) {
    if (oneway && !TryAdd(&g_async_used, footprint, kAsyncBytes)) return false;
    if (!TryAdd(&g_used, footprint, kBytes)) {
        if (oneway) g_async_used.fetch_sub(footprint, std::memory_order_relaxed);
        return false;
    }
    charge->Release();
    charge->bytes_ = footprint;
    charge->oneway_ = oneway;
    return true;
}

}  // namespace vyr_binder

bool VyrBinder_holdTransactionBuffer(size_t bytes) {
    std::lock_guard<std::mutex> lock(vyr_binder::g_held_mutex);
    if (vyr_binder::g_holding) return false;
    vyr_binder::g_holding = vyr_binder::TransactionBuffer::Reserve(
        vyr_binder::TransactionBuffer::Footprint(bytes, 0), /*oneway=*/false, &vyr_binder::g_held);
    return vyr_binder::g_holding;
}

void VyrBinder_releaseTransactionBuffer(void) {
    std::lock_guard<std::mutex> lock(vyr_binder::g_held_mutex);
    vyr_binder::g_held = vyr_binder::TransactionBuffer::Charge();
    vyr_binder::g_holding = false;
}
