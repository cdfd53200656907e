#include <android/binder_process.h>

#include "process_state.h"

void ABinderProcess_startThreadPool(void) {
    vyr_binder::ProcessState::Get().pool().Start();
}

bool ABinderProcess_setThreadPoolMaxThreadCount(uint32_t numThreads) {
    return vyr_binder::ProcessState::Get().pool().SetMaxThreads(numThreads);
}

bool ABinderProcess_isThreadPoolStarted(void) {
    return vyr_binder::ProcessState::Get().pool().IsStarted();
}

void ABinderProcess_joinThreadPool(void) {
    vyr_binder::ProcessState::Get().pool().Join();
}
