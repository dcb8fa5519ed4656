package aidl.hardware.dalix.uwb;

@VintfStability
@Backing(type="byte")
enum MeasurementReportType {
    INITIATOR_TO_RESPONDER = 0,
    RESPONDER_TO_INITIATOR = 1,
}
