// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_ibinder.h>
#include <fuzzer/FuzzedDataProvider.h>

namespace android {

// The host's form of the platform's binder fuzzing driver: sends `binder` transactions with
// codes, flags, parcels and binders drawn from `provider` until its bytes are used up.
void fuzzService(AIBinder* binder, FuzzedDataProvider&& provider);

}  // namespace android
