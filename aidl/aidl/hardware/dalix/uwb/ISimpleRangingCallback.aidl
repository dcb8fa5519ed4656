package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.RangingResult;

@VintfStability
interface ISimpleRangingCallback {
    void onRangingResult(in RangingResult result);
}
