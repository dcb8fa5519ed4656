package aidl.hardware.dalix.uwb;

// One FiRa ranging notification. Field order is the service's own.
@VintfStability
parcelable FiraRangingData {
    int sessionId;
    // The driver's ranging counter (unsigned 32-bit on the wire).
    int index;
}
