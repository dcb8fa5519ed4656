package aidl.hardware.dalix.uwb;

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
