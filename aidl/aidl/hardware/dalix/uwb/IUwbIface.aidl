package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.ICccController;
import aidl.hardware.dalix.uwb.IFiraController;
import aidl.hardware.dalix.uwb.ISimpleRangingController;

// One radio and its controllers.
@VintfStability
interface IUwbIface {
    IFiraController firaController();
    ICccController cccController();
    ISimpleRangingController simpleRangingController();
}
