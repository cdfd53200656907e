// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_parcel.h>
#include <android/binder_status.h>
#include <stdbool.h>
#include <stdint.h>
#include <sys/cdefs.h>
#include <sys/types.h>

__BEGIN_DECLS

typedef uint32_t transaction_code_t;
typedef uint32_t binder_flags_t;

enum {
    // The call returns at once; there is no reply.
    FLAG_ONEWAY = 0x01,
    FLAG_CLEAR_BUF = 0x20,
    FLAG_PRIVATE_VENDOR = 0x10000000,
};

enum {
    FIRST_CALL_TRANSACTION = 0x00000001,
    LAST_CALL_TRANSACTION = 0x00ffffff,
};

struct AIBinder_Class;
typedef struct AIBinder_Class AIBinder_Class;

// A binder object, local (this process implements it) or remote (a proxy).
struct AIBinder;
typedef struct AIBinder AIBinder;

struct AIBinder_Weak;
typedef struct AIBinder_Weak AIBinder_Weak;

struct AIBinder_DeathRecipient;
typedef struct AIBinder_DeathRecipient AIBinder_DeathRecipient;

typedef void* (*AIBinder_Class_onCreate)(void* args);
typedef void (*AIBinder_Class_onDestroy)(void* userData);
typedef binder_status_t (*AIBinder_Class_onTransact)(AIBinder* binder, transaction_code_t code,
                                                     const AParcel* in, AParcel* out);
typedef binder_status_t (*AIBinder_onDump)(AIBinder* binder, int fd, const char** args,
                                           uint32_t numArgs);
typedef binder_status_t (*AIBinder_handleShellCommand)(AIBinder* binder, int in, int out, int err,
                                                       const char** argv, uint32_t argc);

// Classes live for the whole process; they are never freed.
__attribute__((warn_unused_result)) AIBinder_Class* AIBinder_Class_define(
    const char* interfaceDescriptor, AIBinder_Class_onCreate onCreate,
    AIBinder_Class_onDestroy onDestroy, AIBinder_Class_onTransact onTransact) __INTRODUCED_IN(29);
void AIBinder_Class_setOnDump(AIBinder_Class* clazz, AIBinder_onDump onDump) __INTRODUCED_IN(29);
void AIBinder_Class_disableInterfaceTokenHeader(AIBinder_Class* clazz) __INTRODUCED_IN(30);
void AIBinder_Class_setHandleShellCommand(AIBinder_Class* clazz,
                                          AIBinder_handleShellCommand handleShellCommand)
    __INTRODUCED_IN(30);
const char* AIBinder_Class_getDescriptor(const AIBinder_Class* clazz) __INTRODUCED_IN(31);

// Makes a local binder holding one strong reference for the caller; onCreate(args) gives the
// user data.
__attribute__((warn_unused_result)) AIBinder* AIBinder_new(const AIBinder_Class* clazz, void* args)
    __INTRODUCED_IN(29);

bool AIBinder_isRemote(const AIBinder* binder) __INTRODUCED_IN(29);
bool AIBinder_isAlive(const AIBinder* binder) __INTRODUCED_IN(29);
binder_status_t AIBinder_ping(AIBinder* binder) __INTRODUCED_IN(29);
binder_status_t AIBinder_dump(AIBinder* binder, int fd, const char** args, uint32_t numArgs)
    __INTRODUCED_IN(29);

// Links the recipient to the death of a remote binder: onBinderDied(cookie), then
// onUnlinked(cookie), run once on a binder pool thread of this process when it dies; a process
// without a pool gets them once it starts one. STATUS_OK, STATUS_INVALID_OPERATION for a local
// binder, STATUS_DEAD_OBJECT once its death was reported. When it fails, onUnlinked(cookie) has
// run before it returns: the link's cookie is freed there, and only there.
binder_status_t AIBinder_linkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                     void* cookie) __INTRODUCED_IN(29);
// Removes the newest link made with this recipient and exactly this cookie (a null cookie
// matches only a link made with a null cookie), then runs its onUnlinked. STATUS_NAME_NOT_FOUND
// when no such link is left (after its notice too), STATUS_DEAD_OBJECT while the notices run.
// onUnlinked, not the return, says when the cookie may be freed.
binder_status_t AIBinder_unlinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                       void* cookie) __INTRODUCED_IN(29);

// Identity of the process that sent the transaction this thread is serving, else this process.
// The pid is 0 while serving a oneway transaction.
uid_t AIBinder_getCallingUid(void) __INTRODUCED_IN(29);
pid_t AIBinder_getCallingPid(void) __INTRODUCED_IN(29);
bool AIBinder_isHandlingTransaction(void) __INTRODUCED_IN(33);

void AIBinder_incStrong(AIBinder* binder) __INTRODUCED_IN(29);
void AIBinder_decStrong(AIBinder* binder) __INTRODUCED_IN(29);
int32_t AIBinder_debugGetRefCount(AIBinder* binder) __INTRODUCED_IN(29);

bool AIBinder_associateClass(AIBinder* binder, const AIBinder_Class* clazz) __INTRODUCED_IN(29);
const AIBinder_Class* AIBinder_getClass(AIBinder* binder) __INTRODUCED_IN(29);
void* AIBinder_getUserData(AIBinder* binder) __INTRODUCED_IN(29);

// Writes the interface header of the binder's class into a new parcel for a transaction.
binder_status_t AIBinder_prepareTransaction(AIBinder* binder, AParcel** in) __INTRODUCED_IN(29);
// Takes ownership of *in (always deleted, set to null); on success *out is the reply (empty for
// FLAG_ONEWAY, which returns once the receiver's buffer took the call).
// STATUS_FAILED_TRANSACTION when the receiving process's transaction buffer (1 MiB less 8 KiB,
// shared by everything in flight to it, oneway calls at most half) cannot take it; the binder
// stays usable. STATUS_DEAD_OBJECT once the binder's process died.
binder_status_t AIBinder_transact(AIBinder* binder, transaction_code_t code, AParcel** in,
                                  AParcel** out, binder_flags_t flags) __INTRODUCED_IN(29);

__attribute__((warn_unused_result)) AIBinder_Weak* AIBinder_Weak_new(AIBinder* binder)
    __INTRODUCED_IN(29);
void AIBinder_Weak_delete(AIBinder_Weak* weakBinder) __INTRODUCED_IN(29);
__attribute__((warn_unused_result)) AIBinder* AIBinder_Weak_promote(AIBinder_Weak* weakBinder)
    __INTRODUCED_IN(29);
__attribute__((warn_unused_result)) AIBinder_Weak* AIBinder_Weak_clone(const AIBinder_Weak* weak)
    __INTRODUCED_IN(31);
bool AIBinder_Weak_lt(const AIBinder_Weak* lhs, const AIBinder_Weak* rhs) __INTRODUCED_IN(31);
bool AIBinder_lt(const AIBinder* lhs, const AIBinder* rhs) __INTRODUCED_IN(31);

typedef void (*AIBinder_DeathRecipient_onBinderDied)(void* cookie);
typedef void (*AIBinder_DeathRecipient_onBinderUnlinked)(void* cookie);

// Null when onBinderDied is null. One recipient may be linked to many binders.
__attribute__((warn_unused_result)) AIBinder_DeathRecipient* AIBinder_DeathRecipient_new(
    AIBinder_DeathRecipient_onBinderDied onBinderDied) __INTRODUCED_IN(29);
// onUnlinked runs exactly once per link: after onBinderDied, on an unlink or the recipient's
// deletion, or inside a linkToDeath that failed. It is taken when a link is made; set it first.
void AIBinder_DeathRecipient_setOnUnlinked(AIBinder_DeathRecipient* recipient,
                                           AIBinder_DeathRecipient_onBinderUnlinked onUnlinked)
    __INTRODUCED_IN(33);
// Unlinks the recipient from every binder it is still linked to, then frees it. A notice already
// running may finish; free cookies in onUnlinked, not after this returns.
void AIBinder_DeathRecipient_delete(AIBinder_DeathRecipient* recipient) __INTRODUCED_IN(29);

__END_DECLS
