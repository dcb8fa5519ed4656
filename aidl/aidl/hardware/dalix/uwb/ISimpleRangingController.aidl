package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.ISimpleRangingCallback;
import aidl.hardware.dalix.uwb.RangingRequest;
import aidl.hardware.dalix.uwb.UwbCapabilities;

@VintfStability
interface ISimpleRangingController {
    void startInitiatorMode(int panId, long address, int channel);
    void startResponderMode(int panId, long address, int channel);
    void setRangings(in RangingRequest[] requests);
    void getCapabilities(out UwbCapabilities capabilities);
    void stop();
    void setCallback(ISimpleRangingCallback callback);
}
