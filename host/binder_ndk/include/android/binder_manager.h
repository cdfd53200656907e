// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_ibinder.h>
#include <android/binder_status.h>

__BEGIN_DECLS

// Publishes a binder under a name, in place of any earlier registration of the name (of a live
// process too, as servicemanager does; it logs that). Does not take ownership of the binder.
// EX_NONE on success, else an exception code (EX_ILLEGAL_ARGUMENT for a bad name or binder).
// Host: the registry is a directory (VYR_BINDER_DIR), with no SELinux check (EX_SECURITY);
// EX_ILLEGAL_STATE when it cannot be written.
__attribute__((warn_unused_result)) binder_exception_t AServiceManager_addService(
    AIBinder* binder, const char* instance) __INTRODUCED_IN(29);

// The binder published under the name, with a strong reference for the caller, or null.
// checkService answers at once; getService waits up to 5 s for the name to appear;
// waitForService waits until it does. Neither needs a thread pool. Host: the waits are woken by
// the registration at once, where a device without a pool looks again each second.
// getService is deprecated, as the platform's header marks it.
__attribute__((warn_unused_result)) AIBinder* AServiceManager_checkService(const char* instance)
    __INTRODUCED_IN(29);
__attribute__((warn_unused_result)) __attribute__((deprecated(
    "this polls 5s, use AServiceManager_waitForService or AServiceManager_checkService"))) AIBinder*
AServiceManager_getService(const char* instance) __INTRODUCED_IN(29);
__attribute__((warn_unused_result)) AIBinder* AServiceManager_waitForService(const char* instance)
    __INTRODUCED_IN(31);
bool AServiceManager_isDeclared(const char* instance) __INTRODUCED_IN(31);

// A notice of a registration: ownership of one strong reference to `registered` passes to the
// callee, which must AIBinder_decStrong it (or keep it in an ndk::SpAIBinder). `instance` is the
// pointer given at registration. It runs on a binder pool thread (none runs in a process
// without a pool, until it starts one), one at a time per registration, holding the
// registration's lock: no synchronous binder calls, and no delete of this registration from
// here (a device deadlocks; the host aborts with a message).
typedef struct AServiceManager_NotificationRegistration AServiceManager_NotificationRegistration;
typedef void (*AServiceManager_onRegister)(const char* instance, AIBinder* registered, void* cookie);
// Notices for the binder registered under the name now (if any) and for every later
// registration, of the same binder too. `instance` is not copied: it must outlive the
// registration. Null when the name is invalid.
__attribute__((warn_unused_result)) AServiceManager_NotificationRegistration*
AServiceManager_registerForServiceNotifications(const char* instance,
                                                AServiceManager_onRegister onRegister, void* cookie)
    __INTRODUCED_IN(34);
// No notice runs after this returns; it waits for one that is running, so the cookie may be freed
// then.
void AServiceManager_NotificationRegistration_delete(
    AServiceManager_NotificationRegistration* notification) __INTRODUCED_IN(34);

__END_DECLS
