package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum BprfPhrDataRate {
    RATE_850K = 0,
    RATE_6M81 = 1,
}
