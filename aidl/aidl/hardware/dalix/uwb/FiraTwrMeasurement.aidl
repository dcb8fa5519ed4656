package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.FiraAntennaMeasurement;
import aidl.hardware.dalix.uwb.UwbAddress;

// The result for one peer. Field order is the service's own.
@VintfStability
parcelable FiraTwrMeasurement {
    UwbAddress address;
    long timestampNs;
    // 0 is success; any other status leaves the fields below at their defaults.
    byte status;
    int distance;
    // 1 line of sight, 0 none, -1 (255) unknown.
    byte lineOfSight;
    FiraAntennaMeasurement[] antennaMeasurements;
    double azimuthRad;
    double azimuthFigureOfMerit;
    double elevationRad;
    double elevationFigureOfMerit;
}
