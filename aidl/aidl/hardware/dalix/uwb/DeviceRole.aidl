package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum DeviceRole {
    RESPONDER = 0,
    INITIATOR = 1,
}
