package aidl.hardware.dalix.uwb;

@VintfStability
interface ISimpleRangingController {
    void startInitiatorMode(int panId, long address, int channel);
    void startResponderMode(int panId, long address, int channel);
    void setRangings(in RangingRequest[] requests);
    void getCapabilities(out UwbCapabilities capabilities);
    void stop();
    void setCallback(ISimpleRangingCallback callback);
}
