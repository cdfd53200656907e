// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "echo_binder.h"

namespace vyr_test::binder {
namespace {

void* OnCreate(void* args) {
    return args;
}

void OnDestroy(void* /*user_data*/) {}

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
