// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "death_link_registry.h"

#include <utility>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

DeathLinkRegistry::DeathLinkRegistry(VYRService* service,
                                     AIBinder_DeathRecipient_onBinderDied on_died)
    : service_(service), on_died_(on_died) {}

DeathLinkRegistry::~DeathLinkRegistry() {
    std::unordered_map<const DeathCookie*, std::unique_ptr<DeathLink>> links;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        links.swap(links_);
    }
    // Freed here, outside the lock, where each unlink report finds the table empty.
}

void DeathLinkRegistry::Link(ClientEntry* entry) {
    auto owned = std::make_unique<DeathLink>(
        DeathLink{Cookie(entry->callback_binder.get(), service_, this),
                  {AIBinder_DeathRecipient_new(on_died_), &AIBinder_DeathRecipient_delete}});
    DeathLink* link = owned.get();
    {
        std::lock_guard<std::mutex> lock(mutex_);
        links_.emplace(&link->cookie, std::move(owned));
    }
    AIBinder_DeathRecipient_setOnUnlinked(link->recipient.get(), &DeathLinkRegistry::OnUnlinked);
    entry->death_cookie = &link->cookie;
    entry->death_recipient = link->recipient.get();
    if (AIBinder_linkToDeath(entry->callback_binder.get(), entry->death_recipient,
                             const_cast<DeathCookie*>(entry->death_cookie)) != STATUS_OK) {
        // No notice can come for a link that was never made; the runtime has reported it
        // unlinked already.
        entry->death_cookie = nullptr;
        entry->death_recipient = nullptr;
    }
}

void DeathLinkRegistry::Unlink(ClientEntry* entry) {
    if (entry->death_recipient == nullptr) {
        return;
    }
    AIBinder_unlinkToDeath(entry->callback_binder.get(), entry->death_recipient,
                           const_cast<DeathCookie*>(entry->death_cookie));
    entry->death_recipient = nullptr;
    entry->death_cookie = nullptr;
}

void DeathLinkRegistry::LetGo(ClientEntry* entry) {
    if (entry->death_recipient == nullptr) {
        return;
    }
    // The cookie is deliberately null, and no link is made with a null one, so this removes
    // nothing: the link whose notice runs now ends with it, and the runtime reports that.
    AIBinder_unlinkToDeath(entry->callback_binder.get(), entry->death_recipient, nullptr);
    entry->death_recipient = nullptr;
    entry->death_cookie = nullptr;
}

void DeathLinkRegistry::OnUnlinked(void* cookie) {
    const auto* link_cookie = static_cast<const Cookie*>(static_cast<const DeathCookie*>(cookie));
    DeathLinkRegistry* registry = link_cookie->registry;
    std::lock_guard<std::mutex> lock(registry->mutex_);
    auto it = registry->links_.find(link_cookie);
    if (it != registry->links_.end()) {
        it->second->unlinked = true;
    }
}

void DeathLinkRegistry::Sweep() {
    std::vector<std::unique_ptr<DeathLink>> released;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        for (auto it = links_.begin(); it != links_.end();) {
            if (it->second->unlinked) {
                released.push_back(std::move(it->second));
                it = links_.erase(it);
            } else {
                ++it;
            }
        }
    }
    // Deleted outside the lock: deleting a recipient may report an unlink.
}

size_t DeathLinkRegistry::Size() {
    std::lock_guard<std::mutex> lock(mutex_);
    return links_.size();
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
