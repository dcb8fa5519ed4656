package aidl.hardware.dalix.uwb;

@VintfStability
interface ICccController {
    void openCccSession();
    void onOpenCccSessionDone();
    // Returns the value the driver reports for the started session.
    long startCccSession(int first, long timeref, int channel);
}
