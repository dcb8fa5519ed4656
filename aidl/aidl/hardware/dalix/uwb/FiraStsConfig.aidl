package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum FiraStsConfig {
    STATIC = 0,
    DYNAMIC = 1,
    DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY = 2,
}
