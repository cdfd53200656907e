// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "death_link_registry.h"

#include <utility>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

DeathLinkRegistry::DeathLink::DeathLink(AIBinder* binder, VYRService* service,
                                        std::shared_ptr<Links> links,
                                        AIBinder_DeathRecipient_onBinderDied on_died)
    : cookie(binder, service, std::move(links)), recipient(AIBinder_DeathRecipient_new(on_died)) {
    AIBinder_DeathRecipient_setOnUnlinked(recipient, &DeathLinkRegistry::OnUnlinked);
}

DeathLinkRegistry::DeathLink::~DeathLink() {
    if (recipient != nullptr) AIBinder_DeathRecipient_delete(recipient);
}

DeathLinkRegistry::DeathLinkRegistry(VYRService* service,
                                     AIBinder_DeathRecipient_onBinderDied on_died)
    : service_(service), on_died_(on_died) {}

DeathLinkRegistry::~DeathLinkRegistry() {
    std::vector<std::unique_ptr<DeathLink>> released;
    std::vector<AIBinder_DeathRecipient*> linked;
    {
        std::lock_guard<std::mutex> lock(links_->mutex);
        links_->closed = true;
        for (auto it = links_->map.begin(); it != links_->map.end();) {
            if (it->second->unlinked) {
                released.push_back(std::move(it->second));
                it = links_->map.erase(it);
            } else {
                // Stays until its unlink is reported, which frees it.
                linked.push_back(std::exchange(it->second->recipient, nullptr));
                ++it;
            }
        }
    }
    // Outside the lock: deleting a recipient may report an unlink at once.
    for (AIBinder_DeathRecipient* recipient : linked) AIBinder_DeathRecipient_delete(recipient);
}

void DeathLinkRegistry::Link(ClientEntry* entry) {
    auto owned =
        std::make_unique<DeathLink>(entry->callback_binder.get(), service_, links_, on_died_);
    DeathLink* link = owned.get();
    {
        std::lock_guard<std::mutex> lock(links_->mutex);
        links_->map.emplace(&link->cookie, std::move(owned));
    }
    entry->death_cookie = &link->cookie;
    entry->death_recipient = link->recipient;
    if (AIBinder_linkToDeath(entry->callback_binder.get(), entry->death_recipient,
                             const_cast<DeathCookie*>(entry->death_cookie)) != STATUS_OK) {
        // No notice can come for a link that was never made; the runtime reports it unlinked
        // during or shortly after the failed call.
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
    // Its own reference: freeing the link below frees the cookie that holds the other.
    const std::shared_ptr<Links> links = link_cookie->links;
    std::unique_ptr<DeathLink> released;
    {
        std::lock_guard<std::mutex> lock(links->mutex);
        auto it = links->map.find(link_cookie);
        if (it == links->map.end()) return;
        if (!links->closed) {
            // Freed by the next sweep, not inside the runtime's report.
            it->second->unlinked = true;
            return;
        }
        released = std::move(it->second);
        links->map.erase(it);
    }
}

void DeathLinkRegistry::Sweep() {
    std::vector<std::unique_ptr<DeathLink>> released;
    {
        std::lock_guard<std::mutex> lock(links_->mutex);
        for (auto it = links_->map.begin(); it != links_->map.end();) {
            if (it->second->unlinked) {
                released.push_back(std::move(it->second));
                it = links_->map.erase(it);
            } else {
                ++it;
            }
        }
    }
    // Deleted outside the lock: deleting a recipient may report an unlink.
}

size_t DeathLinkRegistry::Size() {
    std::lock_guard<std::mutex> lock(links_->mutex);
    return links_->map.size();
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
