package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.FiraRangingData;
import aidl.hardware.dalix.uwb.FiraTwrMeasurement;
import aidl.hardware.dalix.uwb.UwbAddress;

@VintfStability
interface IFiraSessionCallback {
    void onTwrResult(in FiraRangingData data, in FiraTwrMeasurement[] measurements);
    void onControleesAdded(int sessionId, in UwbAddress[] controlees);
    // reason is always 0.
    void onControleesAddFailed(int sessionId, in UwbAddress[] controlees, int reason);
    void onControleesRemoved(int sessionId, in UwbAddress[] controlees);
    // reason is always 0.
    void onControleesRemoveFailed(int sessionId, in UwbAddress[] controlees, int reason);
    void onSessionStopped(int sessionId);
}
