// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>

#include <cstdint>
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
    // matches only a link made with a null one).
    binder_status_t UnlinkToDeath(const std::shared_ptr<DeathRecipientState>& recipient,
                                  void* cookie) override;
    void DropLinksOf(const DeathRecipientState* recipient) override;

    // Called once, on a pool thread, after the connection died: every link fires exactly once.
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
};

}  // namespace vyr_binder
