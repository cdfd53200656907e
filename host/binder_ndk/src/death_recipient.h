// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>
#include <android/binder_ibinder.h>

#include <atomic>
#include <memory>
#include <mutex>
#include <vector>

namespace vyr_binder {

class RefCounts;

// The shared part of an AIBinder_DeathRecipient: links hold it, so a notice in flight outlives
// the handle.
class DeathRecipientState {
  public:
    explicit DeathRecipientState(AIBinder_DeathRecipient_onBinderDied on_died)
        : on_died_(on_died) {}
    ~DeathRecipientState();

    void SetOnUnlinked(AIBinder_DeathRecipient_onBinderUnlinked on_unlinked) {
        on_unlinked_.store(on_unlinked, std::memory_order_release);
    }
    AIBinder_DeathRecipient_onBinderUnlinked on_unlinked() const {
        return on_unlinked_.load(std::memory_order_acquire);
    }
    // Records a binder this recipient was linked to, so deletion can unlink it.
    void Remember(AIBinder* binder);
    // Unlinks from every remembered binder; no notice is delivered after this returns.
    void Delete();

    bool deleted() const { return deleted_.load(std::memory_order_acquire); }
    void NotifyDied(void* cookie) const;

  private:
    const AIBinder_DeathRecipient_onBinderDied on_died_;
    std::atomic<AIBinder_DeathRecipient_onBinderUnlinked> on_unlinked_{nullptr};
    std::atomic<bool> deleted_{false};
    std::mutex mutex_;
    std::vector<RefCounts*> binders_ GUARDED_BY(mutex_);  // weak references
};

// One link: a recipient, the cookie it was linked with, and the recipient's onUnlinked as it was
// when the link was made (a device captures it then; a later setOnUnlinked does not reach it).
struct DeathLink {
    std::shared_ptr<DeathRecipientState> recipient;
    void* cookie;
    AIBinder_DeathRecipient_onBinderUnlinked on_unlinked;

    void Died() const { recipient->NotifyDied(cookie); }
    // Once per link: after its notice, on an unlink, or when the link could not be made.
    void Unlinked() const {
        if (on_unlinked != nullptr) on_unlinked(cookie);
    }
};

}  // namespace vyr_binder

struct AIBinder_DeathRecipient {
    std::shared_ptr<vyr_binder::DeathRecipientState> state;
};
