package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum FcsType {
    CRC_16 = 0,
    CRC_32 = 1,
}
