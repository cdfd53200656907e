// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <sys/types.h>

#include <cstdint>

namespace vyr_binder {

class Connection;

// Who sent the transaction the current thread is serving, and which one it is, so that calls
// made while serving it are routed back to the waiting caller's thread.
struct CallContext {
    uid_t uid;
    pid_t pid;
    bool in_transaction;
    const Connection* connection;  // where the served transaction came from
    uint64_t transaction_id;       // its id in the sender's numbering
    CallContext* outer;

    static const CallContext& Current();
};

// Installs a context for the scope of serving one incoming transaction.
class ScopedCallContext {
  public:
    ScopedCallContext(uid_t uid, pid_t pid, const Connection* connection, uint64_t transaction_id);
    ~ScopedCallContext();
    ScopedCallContext(const ScopedCallContext&) = delete;
    ScopedCallContext& operator=(const ScopedCallContext&) = delete;

    // The innermost transaction being served that came from `connection`, or 0.
    static uint64_t ParentFor(const Connection* connection);

  private:
    CallContext context_;
};

}  // namespace vyr_binder
