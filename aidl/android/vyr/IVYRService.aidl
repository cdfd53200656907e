// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

package android.vyr;

import android.vyr.Event;
import android.vyr.IEventCallback;

/**
 * The sensors of the service "vyrservice", shared between clients: a client opens a handle for
 * one sensor mode (1: spectral ambient light, 3: range), enables it with a period, and takes
 * events by PollOnce or through an IEventCallback.
 *
 * Result codes: each method's result code is its return value, so the generated C++ carries it
 * as the last out-parameter; the binder status itself is always OK, also when the call failed.
 * Codes are 0, a handle, -1 or a negated errno: -17 EEXIST, -19 ENODEV, -22 EINVAL, -38 ENOSYS,
 * -61 ENODATA, in version 2 -95 EOPNOTSUPP, and in version 3 -12 ENOMEM. Methods without a
 * result report nothing.
 *
 * Threading: every call runs on a binder thread of the service, and all of them one at a time
 * under one lock; a call that waits more than 10 s for it ends the service. Periods are
 * milliseconds on the service's steady clock.
 */
interface IVYRService {
    /**
     * A new client of `mode`: its handle (positive), or -22 for a mode other than 1 and 3, -1
     * with ten clients open, -19 when the mode's sensor is absent. Touches no sensor.
     */
    int Open(int mode);
    /** Ends the client; an unknown handle is ignored. Call Disable first. */
    void Close(int handle);
    /**
     * Samples the client's mode every `period` ms (below 1: 1000 ms); the mode samples at the
     * smallest period that its enabled clients asked for. 0, -38 for an unknown handle, -17 when
     * already enabled. The sensor is switched on after the call returns.
     */
    int Enable(int handle, int period);
    /** Withdraws the client's enable request; a disabled or unknown client is left as it is. */
    void Disable(int handle);
    /**
     * The client's event sink, linked to its death: 0, -22 for an unknown handle, -1 while the
     * client is enabled (set it before Enable).
     */
    int SetCallback(int handle, IEventCallback callback);
    /**
     * Light mode only: the light sensor is switched off between samples while this is set and
     * one client is open. The setting is the service's, not the client's: the last caller wins.
     * 0, -38 for an unknown handle, -22 for a range client.
     */
    int EnableLowPower(int handle, boolean enable);
    /**
     * The mode's latest sample, if this handle has not taken it yet: 0 with `event` filled, -61
     * when there is no new valid sample (`event` is left as it was), -22 for an unknown handle.
     */
    int PollOnce(int handle, out Event event);
    /**
     * Range clients only: eleven control values for the range sensor. 0, -38 for an unknown
     * handle, -22 for a light client or another count of values.
     */
    int ConfigureParameters(int handle, in int[] params);
    /** Tells the light sensor the camera torch's state (its low 8 bits); no handle needed. */
    void SetTorchLightState(int state);
    // Version 2. Enables a handle like Enable, but a callback gets each sample as soon as it is
    // stored (every k-th one, k = max(1, round(period / active period))) with no timer of its
    // own. When the active period changes, the next sample is the one nearest a whole period
    // after the last. With maxReportLatency > 0 (milliseconds, at most 60000; more is -22)
    // samples are held up to that long and handed over together through OnEventBatch, which a
    // version 1 callback lacks (-95); a batch is handed over earlier when it reaches 128 KiB in a
    // parcel, and one that the client's process cannot take is split and sent again.
    // Samples wait in a queue of one second of the client's period (at least 16) while its
    // callback is busy: a client slower than its samples for longer loses the oldest, and the
    // service's dump counts them (samples_dropped).
    // The delivery thread of a handle enabled this way is stopped under the service's lock by
    // Disable, Close or the client's death, and waited for after the lock is released: a callback
    // that calls back, is slow or never answers holds only the call that stops it (until it
    // returns or its process dies), never another client's call.
    int EnableOnSample(int handle, int period, int maxReportLatency);
    // Version 2. Delivers what is held and queued for the handle at once, then calls
    // OnFlushComplete. Every Flush answered 0 is completed, after all that was held when it was
    // called, also when Disable, Close or a new EnableOnSample follows; only the death of the
    // client's process ends it unanswered. 0, -38 for an unknown handle, -22 for a handle not
    // enabled on sample with a callback, -95 for a version 1 callback.
    int Flush(int handle);
    // Version 3. Enables a handle like Enable (at most every `period` ms, below 1: 1000 ms; a
    // callback set before is served as Enable serves it) and hands over, in `ring`, a read-only
    // descriptor of the handle's mode's sample ring: shared memory that the service writes each
    // valid sample into as it stores it, for as long as at least one handle is enabled this way,
    // so that a reader matches samples to camera frames by their boottime with no call per
    // sample. Layout, sequence numbers and the reading protocol: vyr/sample_ring_layout.h (ring
    // layout version 1). Every client's ring of one mode is the same memory. The handle counts
    // among the ten clients and is released as any other: by Disable, Close or its process's
    // death; the mapping stays readable afterwards, but the ring is no longer written for it.
    // 0 with `ring` set; -38 for an unknown handle and -17 for a handle already enabled (as
    // Enable); -19 when the handle's mode has no sensor; -12 ENOMEM when the ring's memory cannot
    // be made. `ring` is null whenever the result is not 0.
    int EnableRing(int handle, int period, out @nullable ParcelFileDescriptor ring);
}
