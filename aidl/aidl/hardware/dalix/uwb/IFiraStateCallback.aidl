package aidl.hardware.dalix.uwb;

// Stored by the FiRa controller; the service calls none of its operations,
// so it declares none.
@VintfStability
interface IFiraStateCallback {
}
