package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum MultiNodeMode {
    UNICAST = 0,
    ONE_TO_MANY = 1,
    MANY_TO_MANY = 2,
}
