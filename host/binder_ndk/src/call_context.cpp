// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "call_context.h"

#include <unistd.h>

namespace vyr_binder {
namespace {

thread_local CallContext* t_current = nullptr;

}  // namespace

const CallContext& CallContext::Current() {
    if (t_current != nullptr) return *t_current;
    thread_local CallContext self{getuid(), getpid(), false, nullptr, 0, nullptr};
    self.pid = getpid();
    return self;
}

ScopedCallContext::ScopedCallContext(uid_t uid, pid_t pid, const Connection* connection,
                                     uint64_t transaction_id)
    : context_{uid, pid, true, connection, transaction_id, t_current} {
    t_current = &context_;
}

ScopedCallContext::~ScopedCallContext() {
    t_current = context_.outer;
}

uint64_t ScopedCallContext::ParentFor(const Connection* connection) {
    for (CallContext* c = t_current; c != nullptr; c = c->outer) {
        if (c->connection == connection) return c->transaction_id;
    }
    return 0;
}

}  // namespace vyr_binder
