// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "proxy_binder.h"

#include <fcntl.h>
#include <stdio.h>
#include <vyr/binder_host.h>

#include <algorithm>
#include <atomic>
#include <iterator>
#include <optional>
#include <utility>

#include "connection.h"
#include "dump_arguments.h"
#include "parcel.h"

namespace vyr_binder {
namespace {

std::atomic<int> g_live_proxies{0};

}  // namespace

ProxyBinder::ProxyBinder(std::shared_ptr<Connection> connection, uint64_t remote_id,
                         std::string descriptor)
    : AIBinder(nullptr),
      connection_(std::move(connection)),
      remote_id_(remote_id),
      descriptor_(std::move(descriptor)) {
    g_live_proxies.fetch_add(1, std::memory_order_relaxed);
}

ProxyBinder::~ProxyBinder() {
    connection_->ForgetProxy(this);
    g_live_proxies.fetch_sub(1, std::memory_order_relaxed);
}

bool ProxyBinder::IsAlive() const {
    return !connection_->dead();
}

binder_status_t ProxyBinder::Transact(transaction_code_t code, AParcel* in, AParcel* out,
                                      binder_flags_t flags) {
    return connection_->Transact(remote_id_, code, *in, out, flags);
}

binder_status_t ProxyBinder::Dump(int fd, const char** args, uint32_t num_args) {
    if (!IsAlive()) return STATUS_DEAD_OBJECT;
    if (fd < 0 || fcntl(fd, F_GETFD) < 0) return STATUS_BAD_VALUE;
    AParcel in;
    binder_status_t status = AParcel_writeParcelFileDescriptor(&in, fd);
    if (status == STATUS_OK) status = WriteDumpArguments(&in, args, num_args);
    if (status != STATUS_OK) return status;
    AParcel out;
    return connection_->Transact(remote_id_, kDumpTransaction, in, &out, 0);
}

binder_status_t ProxyBinder::LinkToDeath(const DeathLink& link) {
    std::lock_guard<std::mutex> lock(mutex_);
    // A death not yet reported still reaches a link made now, as on a device, where the driver
    // answers a link to a dead object with its notice.
    if (obituaries_sent_) return STATUS_DEAD_OBJECT;
    links_.push_back(link);
    return STATUS_OK;
}

binder_status_t ProxyBinder::UnlinkToDeath(const std::shared_ptr<DeathRecipientState>& recipient,
                                           void* cookie) {
    std::optional<DeathLink> removed;
    binder_status_t status = STATUS_OK;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        // Once every notice has run, the links are gone.
        if (obituaries_done_) return STATUS_NAME_NOT_FOUND;
        const auto matches = [&](const DeathLink& link) {
            return link.recipient == recipient && link.cookie == cookie;
        };
        if (obituaries_sent_) {
            // The NDK drops its own reference to the link whatever the driver says; the
            // obituary list holds links weakly, so a link not yet notified gets no notice.
            status = STATUS_DEAD_OBJECT;
            auto it = std::find_if(pending_.rbegin(), pending_.rend(), matches);
            if (it != pending_.rend()) {
                removed = std::move(*it);
                pending_.erase(std::next(it).base());
            }
        } else {
            auto it = std::find_if(links_.rbegin(), links_.rend(), matches);
            if (it != links_.rend()) {
                removed = std::move(*it);
                links_.erase(std::next(it).base());
            } else {
                status = STATUS_NAME_NOT_FOUND;
            }
        }
    }
    if (removed && status == STATUS_DEAD_OBJECT) {
        // What the platform's NDK logs for it (ibinder.cpp).
        fprintf(
            stderr,
            "AIBinder_unlinkToDeath: removed reference to death recipient but unlink failed.\n");
    }
    if (removed) removed->Unlinked();
    return status;
}

void ProxyBinder::DropLinksOf(const DeathRecipientState* recipient) {
    std::vector<DeathLink> removed;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        for (auto it = links_.begin(); it != links_.end();) {
            if (it->recipient.get() == recipient) {
                removed.push_back(std::move(*it));
                it = links_.erase(it);
            } else {
                ++it;
            }
        }
    }
    for (const DeathLink& link : removed) link.Unlinked();
}

void ProxyBinder::SendObituaries() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (obituaries_sent_) return;
        obituaries_sent_ = true;
        pending_.assign(std::make_move_iterator(links_.begin()),
                        std::make_move_iterator(links_.end()));
        links_.clear();
    }
    while (true) {
        std::optional<DeathLink> link;
        {
            std::lock_guard<std::mutex> lock(mutex_);
            if (pending_.empty()) {
                obituaries_done_ = true;
                return;
            }
            link = std::move(pending_.front());
            pending_.pop_front();
        }
        link->Died();
        link->Unlinked();
    }
}

}  // namespace vyr_binder

int VyrBinder_liveProxyCount(void) {
    return vyr_binder::g_live_proxies.load(std::memory_order_relaxed);
}
