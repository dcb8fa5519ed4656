package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.IUwbClientCallback;
import aidl.hardware.dalix.uwb.IUwbIface;

// The root service object, one per device.
@VintfStability
interface IUwb {
    void open(IUwbClientCallback callback);
    void listIfaceNames(out List<String> names);
    IUwbIface getIface(String name);
    void close();
    void loadCalibration(long hwIndex, String path);
    void listHardwareIndex(out long[] hwIndices);
}
