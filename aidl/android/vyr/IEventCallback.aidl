// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

package android.vyr;

import android.vyr.Event;

/**
 * Where the service pushes the events of one enabled client that set it (IVYRService.SetCallback).
 *
 * Two-way on purpose: a slow client only slows its own notification thread.
 */
interface IEventCallback {
    /**
     * One new sample of the client's mode, delivered at most once: once per client period for a
     * client enabled with Enable, as each sample is stored for one enabled with EnableOnSample.
     *
     * The service calls it from that client's own notification thread and waits for it to return;
     * the next poll is one period after the return, so a slow OnEvent lengthens its own cycle and
     * no other client's. In the client it runs on a binder thread of the process's pool, one event
     * at a time for a handle. It may call any IVYRService method, Disable and Close of its own
     * handle included (the service then ends this client's notifications after the call returns).
     * The returned status is not read: an error, or the client's death, does not stop the
     * notifications; a dead client's handle is released through its death notice.
     */
    void OnEvent(in Event event);
    // Version 2. The samples held for a client enabled with a maximum report latency, oldest
    // first.
    void OnEventBatch(in Event[] events);
    // Version 2. Everything held for `handle` when its Flush was called has been delivered.
    void OnFlushComplete(int handle);
}
