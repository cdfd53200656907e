package android.vyr;

import android.vyr.Event;
import android.vyr.IEventCallback;

// Each method's result code is its return value, so the generated C++ carries it as the last
// out-parameter; the binder status itself is always OK.
interface IVYRService {
    int Open(int mode);
    void Close(int handle);
    int Enable(int handle, int period);
    void Disable(int handle);
    int SetCallback(int handle, IEventCallback callback);
    int EnableLowPower(int handle, boolean enable);
    int PollOnce(int handle, out Event event);
    int ConfigureParameters(int handle, in int[] params);
    void SetTorchLightState(int state);
    // Version 2. Enables a handle like Enable, but a callback gets each sample as soon as it is
    // stored (every k-th one, k = max(1, round(period / active period))) with no timer of its
    // own. With maxReportLatency > 0 (milliseconds) samples are held up to that long and handed
    // over together through OnEventBatch, which a version 1 callback lacks (-95).
    int EnableOnSample(int handle, int period, int maxReportLatency);
    // Version 2. Delivers what is held for the handle at once, then calls OnFlushComplete.
    int Flush(int handle);
}
