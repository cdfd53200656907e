// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "status.h"

#include <cstring>
#include <string>

namespace {

AStatus* Make(binder_exception_t exception, int32_t error_code, const char* message) {
    AStatus* status = new AStatus;
    status->exception = exception;
    status->error_code = error_code;
    if (message != nullptr) status->message = message;
    return status;
}

const char* ExceptionName(binder_exception_t exception) {
    switch (exception) {
        case EX_NONE:
            return "EX_NONE";
        case EX_SECURITY:
            return "EX_SECURITY";
        case EX_BAD_PARCELABLE:
            return "EX_BAD_PARCELABLE";
        case EX_ILLEGAL_ARGUMENT:
            return "EX_ILLEGAL_ARGUMENT";
        case EX_NULL_POINTER:
            return "EX_NULL_POINTER";
        case EX_ILLEGAL_STATE:
            return "EX_ILLEGAL_STATE";
        case EX_NETWORK_MAIN_THREAD:
            return "EX_NETWORK_MAIN_THREAD";
        case EX_UNSUPPORTED_OPERATION:
            return "EX_UNSUPPORTED_OPERATION";
        case EX_SERVICE_SPECIFIC:
            return "EX_SERVICE_SPECIFIC";
        case EX_PARCELABLE:
            return "EX_PARCELABLE";
        case EX_TRANSACTION_FAILED:
            return "EX_TRANSACTION_FAILED";
        default:
            return "UNKNOWN";
    }
}

}  // namespace

AStatus* AStatus_newOk(void) {
    return Make(EX_NONE, 0, nullptr);
}

AStatus* AStatus_fromExceptionCode(binder_exception_t exception) {
    return AStatus_fromExceptionCodeWithMessage(exception, nullptr);
}

AStatus* AStatus_fromExceptionCodeWithMessage(binder_exception_t exception, const char* message) {
    int32_t code = exception == EX_TRANSACTION_FAILED ? STATUS_FAILED_TRANSACTION : 0;
    return Make(exception, code, message);
}

AStatus* AStatus_fromServiceSpecificError(int32_t serviceSpecific) {
    return Make(EX_SERVICE_SPECIFIC, serviceSpecific, nullptr);
}

AStatus* AStatus_fromServiceSpecificErrorWithMessage(int32_t serviceSpecific, const char* message) {
    return Make(EX_SERVICE_SPECIFIC, serviceSpecific, message);
}

AStatus* AStatus_fromStatus(binder_status_t status) {
    if (status == STATUS_OK) return Make(EX_NONE, 0, nullptr);
    return Make(EX_TRANSACTION_FAILED, status, nullptr);
}

bool AStatus_isOk(const AStatus* status) {
    return status == nullptr || status->exception == EX_NONE;
}

binder_exception_t AStatus_getExceptionCode(const AStatus* status) {
    return status == nullptr ? EX_NONE : status->exception;
}

int32_t AStatus_getServiceSpecificError(const AStatus* status) {
    if (status == nullptr || status->exception != EX_SERVICE_SPECIFIC) return 0;
    return status->error_code;
}

binder_status_t AStatus_getStatus(const AStatus* status) {
    if (status == nullptr || status->exception != EX_TRANSACTION_FAILED) return STATUS_OK;
    return status->error_code;
}

const char* AStatus_getMessage(const AStatus* status) {
    return status == nullptr ? "" : status->message.c_str();
}

const char* AStatus_getDescription(const AStatus* status) {
    std::string text;
    binder_exception_t exception = AStatus_getExceptionCode(status);
    if (exception == EX_NONE) {
        text = "No error";
    } else {
        text = "Status(" + std::to_string(exception) + ", " + ExceptionName(exception) + "): '";
        if (exception == EX_SERVICE_SPECIFIC || exception == EX_TRANSACTION_FAILED) {
            text += std::to_string(status->error_code) + ": ";
        }
        text += status->message + "'";
    }
    return strdup(text.c_str());
}

void AStatus_deleteDescription(const char* description) {
    free(const_cast<char*>(description));
}

void AStatus_delete(AStatus* status) {
    delete status;
}
