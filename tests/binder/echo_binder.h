// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>

namespace vyr_test::binder {

// A hand-written binder class: kEchoBinder sends back the binder it receives, kIdentity replies
// with the caller's uid and pid as the runtime reports them.
constexpr transaction_code_t kEchoBinder = FIRST_CALL_TRANSACTION;
constexpr transaction_code_t kIdentity = FIRST_CALL_TRANSACTION + 1;
// A ParcelFileDescriptor (may be null) in; the text of its file (empty for null) and the same
// descriptor back.
constexpr transaction_code_t kEchoDescriptor = FIRST_CALL_TRANSACTION + 2;
// A ParcelFileDescriptor and a string in; writes the string to the descriptor. Also oneway.
constexpr transaction_code_t kWriteToDescriptor = FIRST_CALL_TRANSACTION + 3;
// A binder of this class, a ParcelFileDescriptor and a string in; sends the descriptor and the
// string on to the binder's kWriteToDescriptor and replies with that call's status.
constexpr transaction_code_t kForwardDescriptor = FIRST_CALL_TRANSACTION + 4;

const AIBinder_Class* EchoClass();
ndk::SpAIBinder MakeEcho();

}  // namespace vyr_test::binder
