package android.vyr;

// One reading of a sensor mode, as the service hands it to a client.
parcelable Event {
    // The sensor's unsigned status byte, zero-extended (an AIDL byte is signed).
    int status;
    long timestamp;
    float value0;
    float value1;
    float[] data;
    // When the sensor library returned the reading, in CLOCK_BOOTTIME nanoseconds: the clock of
    // camera frames (elapsedRealtimeNanos), so that a reading can be matched to a frame.
    long boottime;
}
