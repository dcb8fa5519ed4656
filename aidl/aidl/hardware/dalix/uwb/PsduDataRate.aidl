package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum PsduDataRate {
    RATE_6M81 = 0,
    RATE_7M80 = 1,
    RATE_27M2 = 2,
    RATE_31M2 = 3,
}
