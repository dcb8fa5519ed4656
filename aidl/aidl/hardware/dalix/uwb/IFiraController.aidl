package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.FiraCapabilities;
import aidl.hardware.dalix.uwb.FiraTwrSession;
import aidl.hardware.dalix.uwb.IFiraSessionCallback;
import aidl.hardware.dalix.uwb.IFiraStateCallback;
import aidl.hardware.dalix.uwb.UwbAddress;

@VintfStability
interface IFiraController {
    void setStateCallback(IFiraStateCallback callback);
    void clearStateCallback();
    void setSessionCallback(IFiraSessionCallback callback);
    void clearSessionCallback();
    void getCapabilities(out FiraCapabilities capabilities);
    void initNewTwrSession(in FiraTwrSession session);
    void updateTwrSession(in FiraTwrSession session);
    void startRangingSession(int sessionId);
    void updateTwoWayRangingBlockStriding(int sessionId, int blockStridingValue);
    void addControlees(int sessionId, in UwbAddress[] controlees, in @nullable int[] subSessionIds);
    void removeControlees(int sessionId, in UwbAddress[] controlees);
    void stopRangingSession(int sessionId);
    int getSessionCount();
    void deinitSession(int sessionId);
    void reset();
}
