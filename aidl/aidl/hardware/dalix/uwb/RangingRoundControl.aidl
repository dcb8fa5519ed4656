package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.MeasurementReportType;

@VintfStability
parcelable RangingRoundControl {
    boolean hasResultReportPhase;
    MeasurementReportType measurementReportType;
    boolean hasDeferredMode;
}
