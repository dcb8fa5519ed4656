package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum AoaType {
    AZIMUTH = 0,
    ELEVATION = 1,
    AZIMUTH_AND_ELEVATION = 2,
}
