// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "binder.h"
#include "death_recipient.h"

namespace vyr_binder {

class Connection;

// A binder implemented by another process, reached over one connection. A process holds at most
// one live proxy per remote object.
class ProxyBinder : public AIBinder {
  public:
    ProxyBinder(std::shared_ptr<Connection> connection, uint64_t remote_id, std::string descriptor);

    bool IsRemote() const override { return true; }
    bool IsAlive() const override;
    std::string Descriptor() const override { return descriptor_; }
    binder_status_t Transact(transaction_code_t code, AParcel* in, AParcel* out,
                             binder_flags_t flags) override;
    binder_status_t Dump(int fd, const char** args, uint32_t num_args) override;
    binder_status_t LinkToDeath(const DeathLink& link) override;
    // Removes the newest link made with this recipient and this very cookie (a null cookie
    // matches only a link made with a null one). While the notices of a death run, a link whose
    // notice has not come yet is removed too: it gets none, its onUnlinked runs here, and the
    // answer is STATUS_DEAD_OBJECT, as libbinder's BpBinder gives once its obituaries are sent.
    binder_status_t UnlinkToDeath(const std::shared_ptr<DeathRecipientState>& recipient,
                                  void* cookie) override;
    void DropLinksOf(const DeathRecipientState* recipient) override;

    // Called once, on a pool thread, after the connection died: every link still linked when its
    // turn comes fires exactly once, in the order the links were made.
    void SendObituaries();

    const std::shared_ptr<Connection>& connection() const { return connection_; }
    uint64_t remote_id() const { return remote_id_; }
    // References the peer handed us for this object; given back when the proxy goes.
    uint32_t acquired_ = 0;  // guarded by the connection's mutex

  private:
    ~ProxyBinder() override;

    const std::shared_ptr<Connection> connection_;
    const uint64_t remote_id_;
    const std::string descriptor_;
    std::mutex mutex_;
    bool obituaries_sent_ GUARDED_BY(mutex_) = false;
    // Every notice has run; the links are gone.
    bool obituaries_done_ GUARDED_BY(mutex_) = false;
    std::vector<DeathLink> links_ GUARDED_BY(mutex_);
    // The links whose notices have yet to run, once the obituaries are sent.
    std::deque<DeathLink> pending_ GUARDED_BY(mutex_);
};

}  // namespace vyr_binder
