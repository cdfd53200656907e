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
     * at a time for a handle. The returned status is not read: an error, or the client's death,
     * does not stop the notifications; a dead client's handle is released through its death notice.
     *
     * Calls back into the service. From its own thread, OnEvent may call any IVYRService method,
     * Disable and Close of its own handle included (the service then ends this client's
     * notifications after the call returns). For a client enabled with Enable, one case cannot be
     * served: another thread of the same client disabling or closing that handle meanwhile. Disable
     * and Close wait, holding the service's lock, for OnEvent to return; a nested call waits for
     * that lock; after 10 s the service ends itself, and every client loses it. A slow OnEvent, or
     * one that never answers, does the same to a Disable or Close from another thread. To avoid
     * it, end the nested calls and let the callback return before calling Disable or Close from
     * another thread, as libvyrclient's SensorClient::Stop does.
     *
     * A client enabled with EnableOnSample is not bound by this: Disable and Close stop its
     * delivery thread under the lock and wait for it only after releasing the lock, so a callback
     * that calls back, is slow or never answers holds up no call but that Disable or Close.
     */
    void OnEvent(in Event event);
    // Version 2. The samples held for a client enabled with a maximum report latency, oldest
    // first. Called like OnEvent for a client enabled with EnableOnSample: it may call back, and
    // another thread's Disable or Close of its handle waits for it without holding the service.
    void OnEventBatch(in Event[] events);
    // Version 2. Everything held for `handle` when its Flush was called has been delivered. Called
    // as OnEventBatch is.
    void OnFlushComplete(int handle);
}
