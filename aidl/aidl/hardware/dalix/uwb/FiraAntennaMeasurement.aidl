package aidl.hardware.dalix.uwb;

// Angle data of one antenna pair. Field order is the service's own.
@VintfStability
parcelable FiraAntennaMeasurement {
    // Azimuth-kind or elevation-kind entry, as the result parser sets it.
    byte kind;
    double firstAngleRad;
    double figureOfMerit;
    double secondAngleRad;
}
