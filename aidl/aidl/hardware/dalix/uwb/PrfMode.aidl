package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum PrfMode {
    BPRF = 0,
    HPRF = 1,
}
