package android.vyr;

// One reading of a sensor mode, as the service hands it to a client.
parcelable Event {
    byte status;
    long timestamp;
    float value0;
    float value1;
    float[] data;
}
