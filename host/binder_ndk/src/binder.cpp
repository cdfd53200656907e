// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "binder.h"

#include <memory>

#include "call_context.h"
#include "death_recipient.h"
#include "local_binder.h"
#include "parcel.h"

using vyr_binder::RefCounts;

AIBinder* RefCounts::Promote() {
    int32_t count = strong_.load(std::memory_order_relaxed);
    while (count > 0) {
        if (strong_.compare_exchange_weak(count, count + 1, std::memory_order_acq_rel)) {
            return object_;
        }
    }
    return nullptr;
}

AIBinder::AIBinder(const AIBinder_Class* clazz) : refs_(new RefCounts(this)), clazz_(clazz) {}

AIBinder::~AIBinder() {
    refs_->DecWeak();
}

void AIBinder::DecStrong() {
    if (refs_->strong_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
}

bool AIBinder::AssociateClass(const AIBinder_Class* clazz) {
    const AIBinder_Class* current = GetClass();
    if (current == clazz) return true;
    if (current != nullptr) return false;
    // A proxy takes the class whose descriptor matches what the remote object answers to.
    if (Descriptor() != clazz->descriptor) return false;
    const AIBinder_Class* expected = nullptr;
    return clazz_.compare_exchange_strong(expected, clazz, std::memory_order_acq_rel) ||
           expected == clazz;
}

AIBinder_Class* AIBinder_Class_define(const char* interfaceDescriptor,
                                      AIBinder_Class_onCreate onCreate,
                                      AIBinder_Class_onDestroy onDestroy,
                                      AIBinder_Class_onTransact onTransact) {
    if (interfaceDescriptor == nullptr || onCreate == nullptr || onDestroy == nullptr ||
        onTransact == nullptr) {
        return nullptr;
    }
    AIBinder_Class* clazz = new AIBinder_Class;
    clazz->descriptor = interfaceDescriptor;
    clazz->on_create = onCreate;
    clazz->on_destroy = onDestroy;
    clazz->on_transact = onTransact;
    return clazz;
}

void AIBinder_Class_setOnDump(AIBinder_Class* clazz, AIBinder_onDump onDump) {
    if (clazz != nullptr) clazz->on_dump = onDump;
}

void AIBinder_Class_disableInterfaceTokenHeader(AIBinder_Class* clazz) {
    if (clazz != nullptr) clazz->write_header = false;
}

void AIBinder_Class_setHandleShellCommand(AIBinder_Class* clazz,
                                          AIBinder_handleShellCommand handleShellCommand) {
    if (clazz != nullptr) clazz->handle_shell_command = handleShellCommand;
}

const char* AIBinder_Class_getDescriptor(const AIBinder_Class* clazz) {
    return clazz == nullptr ? nullptr : clazz->descriptor.c_str();
}

AIBinder* AIBinder_new(const AIBinder_Class* clazz, void* args) {
    if (clazz == nullptr) return nullptr;
    return new vyr_binder::LocalBinder(clazz, clazz->on_create(args));
}

bool AIBinder_isRemote(const AIBinder* binder) {
    return binder != nullptr && binder->IsRemote();
}

bool AIBinder_isAlive(const AIBinder* binder) {
    return binder != nullptr && binder->IsAlive();
}

binder_status_t AIBinder_ping(AIBinder* binder) {
    if (binder == nullptr) return STATUS_UNEXPECTED_NULL;
    AParcel in;
    AParcel out;
    return binder->Transact(vyr_binder::kPingTransaction, &in, &out, 0);
}

binder_status_t AIBinder_dump(AIBinder* binder, int fd, const char** args, uint32_t numArgs) {
    if (binder == nullptr) return STATUS_UNEXPECTED_NULL;
    return binder->Dump(fd, args, numArgs);
}

binder_status_t AIBinder_linkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                     void* cookie) {
    if (binder == nullptr || recipient == nullptr) return STATUS_UNEXPECTED_NULL;
    const vyr_binder::DeathLink link{recipient->state, cookie, recipient->state->on_unlinked()};
    binder_status_t status = binder->LinkToDeath(link);
    if (status == STATUS_OK) {
        recipient->state->Remember(binder);
    } else {
        // A link that was never made is reported unlinked before the call returns, as on a
        // device: the caller frees its cookie there, and only there.
        link.Unlinked();
    }
    return status;
}

binder_status_t AIBinder_unlinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                       void* cookie) {
    if (binder == nullptr || recipient == nullptr) return STATUS_UNEXPECTED_NULL;
    return binder->UnlinkToDeath(recipient->state, cookie);
}

uid_t AIBinder_getCallingUid(void) {
    return vyr_binder::CallContext::Current().uid;
}

pid_t AIBinder_getCallingPid(void) {
    return vyr_binder::CallContext::Current().pid;
}

bool AIBinder_isHandlingTransaction(void) {
    return vyr_binder::CallContext::Current().in_transaction;
}

void AIBinder_incStrong(AIBinder* binder) {
    if (binder != nullptr) binder->IncStrong();
}

void AIBinder_decStrong(AIBinder* binder) {
    if (binder != nullptr) binder->DecStrong();
}

int32_t AIBinder_debugGetRefCount(AIBinder* binder) {
    return binder == nullptr ? -1 : binder->StrongCount();
}

bool AIBinder_associateClass(AIBinder* binder, const AIBinder_Class* clazz) {
    if (binder == nullptr || clazz == nullptr) return false;
    return binder->AssociateClass(clazz);
}

const AIBinder_Class* AIBinder_getClass(AIBinder* binder) {
    return binder == nullptr ? nullptr : binder->GetClass();
}

void* AIBinder_getUserData(AIBinder* binder) {
    return binder == nullptr ? nullptr : binder->UserData();
}

binder_status_t AIBinder_prepareTransaction(AIBinder* binder, AParcel** in) {
    if (binder == nullptr || in == nullptr) return STATUS_UNEXPECTED_NULL;
    const AIBinder_Class* clazz = binder->GetClass();
    if (clazz == nullptr) return STATUS_INVALID_OPERATION;
    std::unique_ptr<AParcel> parcel(new AParcel);
    parcel->data.reserve(vyr_binder::kSmallParcelBytes);
    AIBinder_incStrong(binder);
    parcel->target.set(binder);
    if (clazz->write_header) {
        binder_status_t status = AParcel_writeInt32(parcel.get(), vyr_binder::kInterfaceTokenMarker);
        if (status == STATUS_OK) {
            status = AParcel_writeString(parcel.get(), clazz->descriptor.data(),
                                         static_cast<int32_t>(clazz->descriptor.size()));
        }
        if (status != STATUS_OK) return status;
    }
    *in = parcel.release();
    return STATUS_OK;
}

binder_status_t AIBinder_transact(AIBinder* binder, transaction_code_t code, AParcel** in,
                                  AParcel** out, binder_flags_t flags) {
    if (in == nullptr) return STATUS_UNEXPECTED_NULL;
    std::unique_ptr<AParcel> request(*in);
    *in = nullptr;
    if (binder == nullptr || request == nullptr || out == nullptr) return STATUS_UNEXPECTED_NULL;
    if (request->target.get() != binder) return STATUS_BAD_VALUE;
    constexpr binder_flags_t kAllowed = FLAG_ONEWAY | FLAG_CLEAR_BUF | FLAG_PRIVATE_VENDOR;
    if ((flags & ~kAllowed) != 0) return STATUS_BAD_VALUE;
    std::unique_ptr<AParcel> reply(new AParcel);
    request->pos = 0;
    binder_status_t status = binder->Transact(code, request.get(), reply.get(), flags);
    if (status == STATUS_OK) {
        reply->pos = 0;
        *out = reply.release();
    }
    return status;
}

AIBinder_Weak* AIBinder_Weak_new(AIBinder* binder) {
    if (binder == nullptr) return nullptr;
    binder->refs()->IncWeak();
    return new AIBinder_Weak{binder->refs()};
}

void AIBinder_Weak_delete(AIBinder_Weak* weakBinder) {
    if (weakBinder == nullptr) return;
    weakBinder->refs->DecWeak();
    delete weakBinder;
}

AIBinder* AIBinder_Weak_promote(AIBinder_Weak* weakBinder) {
    return weakBinder == nullptr ? nullptr : weakBinder->refs->Promote();
}

AIBinder_Weak* AIBinder_Weak_clone(const AIBinder_Weak* weak) {
    if (weak == nullptr) return nullptr;
    weak->refs->IncWeak();
    return new AIBinder_Weak{weak->refs};
}

bool AIBinder_Weak_lt(const AIBinder_Weak* lhs, const AIBinder_Weak* rhs) {
    if (lhs == nullptr || rhs == nullptr) return lhs < rhs;
    return std::less<const void*>()(lhs->refs->object(), rhs->refs->object());
}

bool AIBinder_lt(const AIBinder* lhs, const AIBinder* rhs) {
    return std::less<const void*>()(lhs, rhs);
}
