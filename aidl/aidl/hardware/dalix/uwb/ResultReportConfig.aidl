package aidl.hardware.dalix.uwb;

@VintfStability
parcelable ResultReportConfig {
    boolean hasTimeOfFlightReport;
    boolean hasAngleOfArrivalAzimuthReport;
    boolean hasAngleOfArrivalElevationReport;
    boolean hasAngleOfArrivalFigureOfMeritReport;
}
