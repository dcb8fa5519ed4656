package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum RangingRoundUsage {
    OWR = 0,
    SS_TWR = 1,
    DS_TWR = 2,
}
