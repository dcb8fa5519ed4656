package aidl.hardware.dalix.uwb;

// One radio and its controllers.
@VintfStability
interface IUwbIface {
    IFiraController firaController();
    ICccController cccController();
    ISimpleRangingController simpleRangingController();
}
