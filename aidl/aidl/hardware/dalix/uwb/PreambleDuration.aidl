package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum PreambleDuration {
    T32_SYMBOLS = 0,
    T64_SYMBOLS = 1,
}
