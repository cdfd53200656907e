// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_ibinder.h>
#include <android/binder_status.h>

__BEGIN_DECLS

// Publishes a binder under a name. EX_NONE on success, else an exception code
// (EX_ILLEGAL_ARGUMENT for a bad name or binder, EX_ILLEGAL_STATE when the name is held by
// another live process or the registry cannot be written).
__attribute__((warn_unused_result)) binder_exception_t AServiceManager_addService(
    AIBinder* binder, const char* instance) __INTRODUCED_IN(29);

// The binder published under the name, with a strong reference for the caller, or null.
// checkService answers at once; getService waits up to 5 s for the name to appear;
// waitForService waits until it does, woken by the registration itself.
__attribute__((warn_unused_result)) AIBinder* AServiceManager_checkService(const char* instance)
    __INTRODUCED_IN(29);
__attribute__((warn_unused_result)) AIBinder* AServiceManager_getService(const char* instance)
    __INTRODUCED_IN(29);
__attribute__((warn_unused_result)) AIBinder* AServiceManager_waitForService(const char* instance)
    __INTRODUCED_IN(31);
bool AServiceManager_isDeclared(const char* instance) __INTRODUCED_IN(31);

// Registration for notices of a name being registered: `onRegister` runs on a thread of the
// runtime, once for the binder registered under the name now (if any) and once for each later
// registration, with a binder that is valid during the call (AIBinder_incStrong to keep it).
// Deleting the registration stops the notices; none runs after the delete returns, except when
// the delete is called from the notice itself, which then ends on return.
typedef struct AServiceManager_NotificationRegistration AServiceManager_NotificationRegistration;
typedef void (*AServiceManager_onRegister)(const char* instance, AIBinder* registered, void* cookie);
__attribute__((warn_unused_result)) AServiceManager_NotificationRegistration*
AServiceManager_registerForServiceNotifications(const char* instance,
                                                AServiceManager_onRegister onRegister, void* cookie)
    __INTRODUCED_IN(34);
void AServiceManager_NotificationRegistration_delete(
    AServiceManager_NotificationRegistration* notification) __INTRODUCED_IN(34);

__END_DECLS
