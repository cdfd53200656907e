package android.vyr;

import android.vyr.Event;

// Two-way on purpose: a slow client only slows its own notification thread.
interface IEventCallback {
    void OnEvent(in Event event);
}
