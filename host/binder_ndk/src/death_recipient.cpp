// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "death_recipient.h"

#include <utility>

#include "binder.h"

namespace vyr_binder {

DeathRecipientState::~DeathRecipientState() {
    for (RefCounts* refs : binders_) refs->DecWeak();
}

void DeathRecipientState::Remember(AIBinder* binder) {
    std::lock_guard<std::mutex> lock(mutex_);
    for (RefCounts* refs : binders_) {
        if (refs == binder->refs()) return;
    }
    // Forget binders that are gone so repeated links do not grow the list without bound.
    for (size_t i = 0; i < binders_.size();) {
        AIBinder* alive = binders_[i]->Promote();
        if (alive == nullptr) {
            binders_[i]->DecWeak();
            binders_[i] = binders_.back();
            binders_.pop_back();
        } else {
            alive->DecStrong();
            ++i;
        }
    }
    binder->refs()->IncWeak();
    binders_.push_back(binder->refs());
}

void DeathRecipientState::Delete() {
    deleted_.store(true, std::memory_order_release);
    std::vector<RefCounts*> binders;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        binders.swap(binders_);
    }
    for (RefCounts* refs : binders) {
        AIBinder* binder = refs->Promote();
        if (binder != nullptr) {
            binder->DropLinksOf(this);
            binder->DecStrong();
        }
        refs->DecWeak();
    }
}

void DeathRecipientState::NotifyDied(void* cookie) const {
    if (!deleted() && on_died_ != nullptr) on_died_(cookie);
}

}  // namespace vyr_binder

AIBinder_DeathRecipient* AIBinder_DeathRecipient_new(
    AIBinder_DeathRecipient_onBinderDied onBinderDied) {
    if (onBinderDied == nullptr) return nullptr;
    return new AIBinder_DeathRecipient{
        std::make_shared<vyr_binder::DeathRecipientState>(onBinderDied)};
}

void AIBinder_DeathRecipient_setOnUnlinked(AIBinder_DeathRecipient* recipient,
                                           AIBinder_DeathRecipient_onBinderUnlinked onUnlinked) {
    if (recipient != nullptr) recipient->state->SetOnUnlinked(onUnlinked);
}

void AIBinder_DeathRecipient_delete(AIBinder_DeathRecipient* recipient) {
    if (recipient == nullptr) return;
    recipient->state->Delete();
    delete recipient;
}
