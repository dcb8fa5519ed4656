package aidl.hardware.dalix.uwb;

// Reserved for what a FiRa controller can do. The service never fills it in;
// the fields are this interface's own choice.
@VintfStability
parcelable FiraCapabilities {
    int[] supportedChannels;
    int maxSessionCount;
    boolean isBlockStridingSupported;
}
