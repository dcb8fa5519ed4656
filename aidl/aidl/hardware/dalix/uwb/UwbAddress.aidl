package aidl.hardware.dalix.uwb;

@VintfStability
parcelable UwbAddress {
    // First byte first; FiRa sessions take 2-byte short addresses only.
    byte[] address;
}
