package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum DeviceType {
    CONTROLLER = 0,
    CONTROLEE = 1,
}
