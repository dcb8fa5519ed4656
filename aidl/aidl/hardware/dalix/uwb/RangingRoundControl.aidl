package aidl.hardware.dalix.uwb;

@VintfStability
parcelable RangingRoundControl {
    boolean hasResultReportPhase;
    MeasurementReportType measurementReportType;
    boolean hasDeferredMode;
}
