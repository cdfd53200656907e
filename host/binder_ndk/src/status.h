// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_status.h>

#include <string>

struct AStatus {
    binder_exception_t exception = EX_NONE;
    // The transport status for EX_TRANSACTION_FAILED, the service's code for EX_SERVICE_SPECIFIC.
    int32_t error_code = 0;
    std::string message;
};
