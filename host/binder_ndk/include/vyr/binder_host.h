// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <stdbool.h>
#include <stddef.h>
#include <sys/cdefs.h>

__BEGIN_DECLS

// Host runtime only: closes every connection (peers see this process's objects die), removes
// this process's registry entries, makes joinThreadPool return and joins every runtime thread.
// The runtime starts afresh on the next binder call. Must not be called from a runtime thread.
void VyrBinder_shutdown(void);

// Host runtime only: how many proxies (binders of other processes) this process holds now, so
// that tests can tell a leaked reference.
int VyrBinder_liveProxyCount(void);

// Host runtime only: takes `bytes` of this process's transaction buffer, as transactions in
// flight to it from elsewhere would on a device, until VyrBinder_releaseTransactionBuffer; so
// that tests can meet the buffer's limit without that traffic. False, and nothing taken, when
// they do not fit beside what is in flight or something is held already.
bool VyrBinder_holdTransactionBuffer(size_t bytes);
void VyrBinder_releaseTransactionBuffer(void);

__END_DECLS
