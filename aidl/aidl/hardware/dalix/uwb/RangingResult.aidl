package aidl.hardware.dalix.uwb;

// One simple ranging result. Field order is the service's own.
@VintfStability
parcelable RangingResult {
    int id;
    long peerAddress;
    int measurement;
    float firstAngleRad;
    float secondAngleRad;
}
