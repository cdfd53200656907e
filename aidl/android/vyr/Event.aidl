// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

package android.vyr;

/**
 * One reading of a sensor mode, as the service hands it to a client: the sensor library's raw
 * record, converted field by field.
 *
 * Timestamps are the sensor libraries' own time values, not a clock of the service: the range
 * mode's are milliseconds of the range sensor's clock (an unsigned 32-bit count, zero-extended,
 * so it wraps after about 49 days), the light mode's are nanoseconds. Compare timestamps of one
 * mode only.
 */
parcelable Event {
    /**
     * Light mode: the sensor's unsigned status byte, zero-extended (an AIDL byte is signed).
     * Range mode: 0.
     */
    int status;
    /** Range mode (3): milliseconds; light mode (1): nanoseconds. See above. */
    long timestamp;
    /** Light mode: the library's second float of the result (B). Range mode: 0. */
    float value0;
    /** Light mode: the library's first float of the result (A). Range mode: 0. */
    float value1;
    /**
     * Light mode: 5 values, readings r0, r1, r2, r4, r3 (the last two swapped).
     * Range mode: 10 header values (time, then the header fields in order, the zone count ninth)
     * and 11 values per zone for each of the zone count's zones: 10 + 11 x zone count values.
     */
    float[] data;
    /**
     * Version 2: when the sensor library returned the reading, in CLOCK_BOOTTIME nanoseconds, the
     * clock of camera frames (elapsedRealtimeNanos), so that a reading can be matched to a frame.
     * A version 1 reader never sees it.
     */
    long boottime;
}
