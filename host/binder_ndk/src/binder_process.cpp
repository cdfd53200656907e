// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/binder_process.h>

#include "process_state.h"

void ABinderProcess_startThreadPool(void) {
    vyr_binder::ProcessState::Get().looper().StartPool();
}

bool ABinderProcess_setThreadPoolMaxThreadCount(uint32_t numThreads) {
    return vyr_binder::ProcessState::Get().looper().SetMaxThreads(numThreads);
}

bool ABinderProcess_isThreadPoolStarted(void) {
    return vyr_binder::ProcessState::Get().looper().IsStarted();
}

void ABinderProcess_joinThreadPool(void) {
    vyr_binder::ProcessState::Get().looper().Join();
}
