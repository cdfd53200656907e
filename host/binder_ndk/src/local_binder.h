// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <atomic>
#include <cstdint>
#include <deque>
#include <functional>
#include <mutex>
#include <string>

#include "binder.h"

namespace vyr_binder {

// A binder implemented in this process: transactions call its class's onTransact directly.
class LocalBinder : public AIBinder {
  public:
    LocalBinder(const AIBinder_Class* clazz, void* user_data);

    bool IsRemote() const override { return false; }
    bool IsAlive() const override { return true; }
    void* UserData() const override { return user_data_; }
    std::string Descriptor() const override { return GetClass()->descriptor; }
    binder_status_t Transact(transaction_code_t code, AParcel* in, AParcel* out,
                             binder_flags_t flags) override;
    binder_status_t Dump(int fd, const char** args, uint32_t num_args) override;
    // A local binder cannot die while this process runs.
    binder_status_t LinkToDeath(const DeathLink& link) override;
    binder_status_t UnlinkToDeath(const std::shared_ptr<DeathRecipientState>& recipient,
                                  void* cookie) override;
    void DropLinksOf(const DeathRecipientState* /*recipient*/) override {}

    // The process-wide id under which other processes refer to this binder.
    uint64_t ExportId();

    // Oneway calls to one binder run one after another, in arrival order: calls are queued in
    // stream order, and a true result means the caller must now DrainOneway.
    bool QueueOneway(std::function<void()> call);
    void DrainOneway();

  private:
    ~LocalBinder() override;

    void* const user_data_;
    std::atomic<uint64_t> export_id_{0};
    std::mutex oneway_mutex_;
    bool oneway_running_ GUARDED_BY(oneway_mutex_) = false;
    std::deque<std::function<void()>> oneway_queue_ GUARDED_BY(oneway_mutex_);
};

}  // namespace vyr_binder
