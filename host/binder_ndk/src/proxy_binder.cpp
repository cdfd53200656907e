// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "proxy_binder.h"

#include <fcntl.h>

#include <utility>

#include "connection.h"
#include "dump_arguments.h"
#include "parcel.h"

namespace vyr_binder {

ProxyBinder::ProxyBinder(std::shared_ptr<Connection> connection, uint64_t remote_id,
                         std::string descriptor)
    : AIBinder(nullptr),
      connection_(std::move(connection)),
      remote_id_(remote_id),
      descriptor_(std::move(descriptor)) {}

ProxyBinder::~ProxyBinder() {
    connection_->ForgetProxy(this);
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
    binder_status_t status = WriteDumpArguments(&in, args, num_args);
    if (status != STATUS_OK) return status;
    AParcel out;
    return connection_->Transact(remote_id_, kDumpTransaction, in, &out, 0, fd);
}

binder_status_t ProxyBinder::LinkToDeath(std::shared_ptr<DeathRecipientState> recipient,
                                         void* cookie) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (obituaries_sent_ || connection_->dead()) return STATUS_DEAD_OBJECT;
    links_.push_back(DeathLink{std::move(recipient), cookie});
    return STATUS_OK;
}

binder_status_t ProxyBinder::UnlinkToDeath(const std::shared_ptr<DeathRecipientState>& recipient,
                                           void* cookie) {
    std::vector<DeathLink> removed;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (obituaries_sent_) return STATUS_DEAD_OBJECT;
        bool exact = false;
        for (const DeathLink& link : links_) {
            if (link.recipient == recipient && link.cookie == cookie) exact = true;
        }
        for (auto it = links_.begin(); it != links_.end();) {
            bool match = it->recipient == recipient && (it->cookie == cookie || !exact);
            if (match && (exact || cookie == nullptr)) {
                removed.push_back(std::move(*it));
                it = links_.erase(it);
                if (exact) break;
            } else {
                ++it;
            }
        }
    }
    if (removed.empty()) return STATUS_NAME_NOT_FOUND;
    for (const DeathLink& link : removed) link.recipient->NotifyUnlinked(link.cookie);
    return STATUS_OK;
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
    for (const DeathLink& link : removed) link.recipient->NotifyUnlinked(link.cookie);
}

void ProxyBinder::SendObituaries() {
    std::vector<DeathLink> links;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (obituaries_sent_) return;
        obituaries_sent_ = true;
        links.swap(links_);
    }
    for (const DeathLink& link : links) {
        link.recipient->NotifyDied(link.cookie);
        link.recipient->NotifyUnlinked(link.cookie);
    }
}

}  // namespace vyr_binder
