// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/binder_manager.h>

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>

#include "process_state.h"
#include "registry.h"
#include "service_notification.h"

namespace {

using vyr_binder::ProcessState;
using vyr_binder::Registry;

// getService waits this long for a name to appear, as the platform's lookup does for a service
// that is still starting.
constexpr std::chrono::milliseconds kGetServiceWait(5000);

AIBinder* Released(ndk::SpAIBinder binder) {
    AIBinder* raw = binder.get();
    AIBinder_incStrong(raw);
    return raw;
}

// The first binder reported for a name.
struct Waiter {
    static void OnRegister(const char* /*instance*/, AIBinder* registered, void* cookie) {
        ndk::SpAIBinder owned(registered);
        auto* waiter = static_cast<Waiter*>(cookie);
        std::lock_guard<std::mutex> lock(waiter->mutex);
        if (waiter->binder.get() != nullptr) return;
        waiter->binder = std::move(owned);
        waiter->found.notify_all();
    }
    std::mutex mutex;
    std::condition_variable found;
    ndk::SpAIBinder binder;
};

// Woken by the registration itself rather than by looking again and again. A device needs no
// pool here either: its waitForService looks again every second when no notice comes.
AIBinder* LookupUntil(const char* instance, bool forever) {
    if (instance == nullptr || !Registry::IsValidName(instance)) return nullptr;
    Waiter waiter;
    AServiceManager_NotificationRegistration* registration =
        vyr_binder::RegisterForNoticesWithoutPool(instance, &Waiter::OnRegister, &waiter);
    if (registration == nullptr) return nullptr;
    ndk::SpAIBinder binder;
    {
        std::unique_lock<std::mutex> lock(waiter.mutex);
        const auto found = [&waiter] { return waiter.binder.get() != nullptr; };
        if (forever) {
            waiter.found.wait(lock, found);
        } else {
            waiter.found.wait_for(lock, kGetServiceWait, found);
        }
        binder = waiter.binder;
    }
    AServiceManager_NotificationRegistration_delete(registration);
    return binder.get() != nullptr ? Released(binder) : nullptr;
}

}  // namespace

binder_exception_t AServiceManager_addService(AIBinder* binder, const char* instance) {
    if (binder == nullptr || instance == nullptr || !Registry::IsValidName(instance)) {
        return EX_ILLEGAL_ARGUMENT;
    }
    // Only objects of this process can be published.
    if (AIBinder_isRemote(binder)) return EX_ILLEGAL_ARGUMENT;
    AIBinder_incStrong(binder);
    return ProcessState::Get().Publish(instance, ndk::SpAIBinder(binder));
}

AIBinder* AServiceManager_checkService(const char* instance) {
    if (instance == nullptr || !Registry::IsValidName(instance)) return nullptr;
    return Released(ProcessState::Get().Lookup(instance));
}

AIBinder* AServiceManager_getService(const char* instance) {
    return LookupUntil(instance, false);
}

AIBinder* AServiceManager_waitForService(const char* instance) {
    return LookupUntil(instance, true);
}

bool AServiceManager_isDeclared(const char* instance) {
    AIBinder* binder = AServiceManager_checkService(instance);
    AIBinder_decStrong(binder);
    return binder != nullptr;
}
