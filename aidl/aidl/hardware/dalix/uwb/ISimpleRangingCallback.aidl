package aidl.hardware.dalix.uwb;

@VintfStability
interface ISimpleRangingCallback {
    void onRangingResult(in RangingResult result);
}
