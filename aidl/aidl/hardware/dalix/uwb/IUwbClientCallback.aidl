package aidl.hardware.dalix.uwb;

// Passed by the client at open. The service only watches its binder for
// death and calls none of its operations, so it declares none.
@VintfStability
interface IUwbClientCallback {
}
