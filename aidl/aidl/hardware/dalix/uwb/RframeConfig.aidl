package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum RframeConfig {
    // The first name ends in the letter O, and there is no value 2: both are
    // part of the interface as clients know it.
    SPO = 0,
    SP1 = 1,
    SP3 = 3,
}
