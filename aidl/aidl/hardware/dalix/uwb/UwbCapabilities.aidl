package aidl.hardware.dalix.uwb;

@VintfStability
parcelable UwbCapabilities {
    int[] supportedChannels;
}
