// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_status.h>
#include <stdbool.h>
#include <stdint.h>
#include <sys/cdefs.h>

__BEGIN_DECLS

// Starts the process's binder thread pool (one thread at once, more on demand up to the maximum).
// Incoming calls, death notices and registration notices are served by pool threads (and threads
// that joined the pool) only: start it before handing out a binder or linking to a death.
void ABinderProcess_startThreadPool(void);
// The maximum number of pool threads started on demand (default 15). Call before the pool starts.
bool ABinderProcess_setThreadPoolMaxThreadCount(uint32_t numThreads);
// True once ABinderProcess_startThreadPool was called (joining alone does not count).
bool ABinderProcess_isThreadPoolStarted(void);
// The calling thread serves incoming transactions; it returns only when the runtime shuts down.
void ABinderProcess_joinThreadPool(void);

__END_DECLS
