package aidl.hardware.dalix.uwb;

// One simple ranging request. Field order is the service's own.
@VintfStability
parcelable RangingRequest {
    int id;
    // Passed to the driver unchanged.
    int parameter;
    // The peer's extended address.
    long peerAddress;
}
