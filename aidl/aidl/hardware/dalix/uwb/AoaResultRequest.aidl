package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum AoaResultRequest {
    NO_AOA_REPORT = 0,
    REQ_AOA_RESULTS = 1,
}
