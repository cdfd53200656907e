// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "echo_binder.h"

#include <android/binder_parcel_utils.h>
#include <unistd.h>

#include <string>

#include "test_descriptors.h"

namespace vyr_test::binder {
namespace {

void* OnCreate(void* args) {
    return args;
}

void OnDestroy(void* /*user_data*/) {}

binder_status_t EchoDescriptor(const AParcel* in, AParcel* out) {
    ndk::ScopedFileDescriptor received;
    binder_status_t status = ndk::AParcel_readNullableParcelFileDescriptor(in, &received);
    if (status != STATUS_OK) return status;
    const std::string text = received.get() < 0 ? std::string() : ReadText(received.get());
    status = ndk::AParcel_writeString(out, text);
    if (status != STATUS_OK) return status;
    return ndk::AParcel_writeNullableParcelFileDescriptor(out, received);
}

binder_status_t WriteToDescriptor(const AParcel* in) {
    ndk::ScopedFileDescriptor received;
    binder_status_t status = ndk::AParcel_readRequiredParcelFileDescriptor(in, &received);
    if (status != STATUS_OK) return status;
    std::string text;
    status = ndk::AParcel_readString(in, &text);
    if (status != STATUS_OK) return status;
    if (write(received.get(), text.data(), text.size()) != static_cast<ssize_t>(text.size())) {
        return STATUS_UNKNOWN_ERROR;
    }
    return STATUS_OK;
}

binder_status_t ForwardDescriptor(const AParcel* in, AParcel* out) {
    ndk::SpAIBinder target;
    ndk::ScopedFileDescriptor received;
    std::string text;
    binder_status_t status = ndk::AParcel_readRequiredStrongBinder(in, &target);
    if (status == STATUS_OK) status = ndk::AParcel_readRequiredParcelFileDescriptor(in, &received);
    if (status == STATUS_OK) status = ndk::AParcel_readString(in, &text);
    if (status != STATUS_OK) return status;
    if (!AIBinder_associateClass(target.get(), EchoClass())) return STATUS_BAD_TYPE;
    AParcel* call = nullptr;
    status = AIBinder_prepareTransaction(target.get(), &call);
    if (status != STATUS_OK) return status;
    status = ndk::AParcel_writeRequiredParcelFileDescriptor(call, received);
    if (status == STATUS_OK) status = ndk::AParcel_writeString(call, text);
    if (status != STATUS_OK) {
        AParcel_delete(call);
        return status;
    }
    AParcel* reply = nullptr;
    const binder_status_t forwarded =
        AIBinder_transact(target.get(), kWriteToDescriptor, &call, &reply, 0);
    AParcel_delete(reply);
    return AParcel_writeInt32(out, forwarded);
}

binder_status_t OnTransact(AIBinder* /*binder*/, transaction_code_t code, const AParcel* in,
                           AParcel* out) {
    if (code == kEchoBinder) {
        AIBinder* received = nullptr;
        binder_status_t status = AParcel_readStrongBinder(in, &received);
        if (status != STATUS_OK) return status;
        status = AParcel_writeStrongBinder(out, received);
        AIBinder_decStrong(received);
        return status;
    }
    if (code == kIdentity) {
        binder_status_t status =
            AParcel_writeInt32(out, static_cast<int32_t>(AIBinder_getCallingUid()));
        if (status != STATUS_OK) return status;
        return AParcel_writeInt32(out, static_cast<int32_t>(AIBinder_getCallingPid()));
    }
    if (code == kEchoDescriptor) return EchoDescriptor(in, out);
    if (code == kWriteToDescriptor) return WriteToDescriptor(in);
    if (code == kForwardDescriptor) return ForwardDescriptor(in, out);
    return STATUS_UNKNOWN_TRANSACTION;
}

}  // namespace

const AIBinder_Class* EchoClass() {
    static AIBinder_Class* clazz =
        AIBinder_Class_define("vyr.test.IEcho", OnCreate, OnDestroy, OnTransact);
    return clazz;
}

ndk::SpAIBinder MakeEcho() {
    return ndk::SpAIBinder(AIBinder_new(EchoClass(), nullptr));
}

}  // namespace vyr_test::binder
