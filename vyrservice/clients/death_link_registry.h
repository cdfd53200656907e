// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>
#include <android/binder_ibinder.h>

#include <memory>
#include <mutex>
#include <unordered_map>

#include "client_entry.h"

namespace android {
namespace vyr {
namespace binder {

// The death links of the clients' callbacks. A link's cookie (the callback's binder and the
// service) must stay valid for as long as the runtime may deliver a notice with it, which can be
// after its entry has left the table: the registry owns every cookie and recipient, and frees
// one only after the runtime has reported that no notice can come any more (the link was
// removed, or its notice delivered), never inside that report.
class DeathLinkRegistry {
  public:
    // `on_died` gets the cookie (a `const DeathCookie*`) of the link whose binder died; the
    // cookie names `service`.
    DeathLinkRegistry(VYRService* service, AIBinder_DeathRecipient_onBinderDied on_died);
    // Deleting a recipient unlinks what is still linked; the runtime reports each such unlink
    // while the link is being freed, its cookie still valid.
    ~DeathLinkRegistry();
    DeathLinkRegistry(const DeathLinkRegistry&) = delete;
    DeathLinkRegistry& operator=(const DeathLinkRegistry&) = delete;

    // Links the entry's `callback_binder` to death and records the link in the entry. No link is
    // recorded when none could be made (a binder of this process, or one already dead).
    void Link(ClientEntry* entry) EXCLUDES(mutex_);
    // Removes the entry's link, so that its cookie can be given back. A notice already on its way
    // is delivered anyway; the runtime reports the unlink after it.
    static void Unlink(ClientEntry* entry);
    // For an entry whose binder has died: forgets its link without removing it. A link removed
    // while the notices run gets none (libbinder holds obituaries weakly), and that notice may be
    // the one that releases another handle whose callback is the same binder.
    static void LetGo(ClientEntry* entry);
    // Frees the links that the runtime has let go of.
    void Sweep() EXCLUDES(mutex_);
    // Links not yet freed.
    size_t Size() EXCLUDES(mutex_);

  private:
    // What the runtime hands back: the service's cookie, and the registry for the unlink report.
    struct Cookie : DeathCookie {
        Cookie(AIBinder* binder, VYRService* service, DeathLinkRegistry* owner)
            : DeathCookie(binder, service), registry(owner) {}
        DeathLinkRegistry* const registry;
    };
    struct DeathLink {
        Cookie cookie;
        std::unique_ptr<AIBinder_DeathRecipient, void (*)(AIBinder_DeathRecipient*)> recipient;
        bool unlinked = false;
    };

    static void OnUnlinked(void* cookie);

    VYRService* const service_;
    const AIBinder_DeathRecipient_onBinderDied on_died_;
    // Not the API lock: the runtime reports an unlinked link also from inside a method's unlink.
    std::mutex mutex_;
    std::unordered_map<const DeathCookie*, std::unique_ptr<DeathLink>> links_ GUARDED_BY(mutex_);
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
