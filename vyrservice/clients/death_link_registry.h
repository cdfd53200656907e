// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>
#include <android/binder_ibinder.h>

#include <memory>
#include <mutex>
#include <unordered_map>
#include <utility>

#include "client_entry.h"

namespace android {
namespace vyr {
namespace binder {

// The death links of the clients' callbacks. A link's cookie (the callback's binder and the
// service) must stay valid for as long as the runtime may use it: until it reports the link
// unlinked, which can be after its entry has left the table, and after the recipient was deleted
// (binder_ibinder.h: the cookie is cleaned up in onUnlinked, not when the delete returns). The
// registry owns every cookie and recipient and frees a link only once it was reported unlinked,
// never inside that report while the registry lives; links still linked when it goes are freed by
// their own report.
class DeathLinkRegistry {
  public:
    // `on_died` gets the cookie (a `const DeathCookie*`) of the link whose binder died; the
    // cookie names `service`.
    DeathLinkRegistry(VYRService* service, AIBinder_DeathRecipient_onBinderDied on_died);
    // Deletes every recipient, which unlinks what is still linked.
    ~DeathLinkRegistry();
    DeathLinkRegistry(const DeathLinkRegistry&) = delete;
    DeathLinkRegistry& operator=(const DeathLinkRegistry&) = delete;

    // Links the entry's `callback_binder` to death and records the link in the entry. No link is
    // recorded when none could be made (a binder of this process, or one already dead).
    void Link(ClientEntry* entry);
    // Removes the entry's link, so that its cookie can be given back. A notice already on its way
    // is delivered anyway; the runtime reports the unlink after it.
    static void Unlink(ClientEntry* entry);
    // For an entry whose binder has died: forgets its link without removing it. A link removed
    // while the notices run gets none (libbinder holds obituaries weakly), and that notice may be
    // the one that releases another handle whose callback is the same binder.
    static void LetGo(ClientEntry* entry);
    // Frees the links that the runtime has let go of.
    void Sweep();
    // Links not yet freed.
    size_t Size();

  private:
    struct DeathLink;
    // The links, shared with their cookies: it outlives the registry while a link may still be
    // reported.
    struct Links {
        std::mutex mutex;
        std::unordered_map<const DeathCookie*, std::unique_ptr<DeathLink>> map GUARDED_BY(mutex);
        // The registry is gone: a link is freed by its own unlink report.
        bool closed GUARDED_BY(mutex) = false;
    };
    // What the runtime hands back: the service's cookie, and the links for the unlink report.
    struct Cookie : DeathCookie {
        Cookie(AIBinder* binder, VYRService* service, std::shared_ptr<Links> owner)
            : DeathCookie(binder, service), links(std::move(owner)) {}
        const std::shared_ptr<Links> links;
    };
    struct DeathLink {
        DeathLink(AIBinder* binder, VYRService* service, std::shared_ptr<Links> links,
                  AIBinder_DeathRecipient_onBinderDied on_died);
        // Deletes the recipient unless it was handed over to be deleted already.
        ~DeathLink();
        DeathLink(const DeathLink&) = delete;
        DeathLink& operator=(const DeathLink&) = delete;

        Cookie cookie;
        AIBinder_DeathRecipient* recipient;
        bool unlinked = false;
    };

    static void OnUnlinked(void* cookie);

    VYRService* const service_;
    const AIBinder_DeathRecipient_onBinderDied on_died_;
    // Not the API lock: the runtime reports an unlinked link also from inside a method's unlink.
    const std::shared_ptr<Links> links_ = std::make_shared<Links>();
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
