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
}
