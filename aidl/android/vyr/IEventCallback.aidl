package android.vyr;

import android.vyr.Event;

// Two-way on purpose: a slow client only slows its own notification thread.
interface IEventCallback {
    void OnEvent(in Event event);
    // Version 2. The samples held for a client enabled with a maximum report latency, oldest
    // first.
    void OnEventBatch(in Event[] events);
    // Version 2. Everything held for `handle` when its Flush was called has been delivered.
    void OnFlushComplete(int handle);
}
