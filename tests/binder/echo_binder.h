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

const AIBinder_Class* EchoClass();
ndk::SpAIBinder MakeEcho();

}  // namespace vyr_test::binder
