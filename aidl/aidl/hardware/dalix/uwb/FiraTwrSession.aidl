package aidl.hardware.dalix.uwb;

import aidl.hardware.dalix.uwb.AoaResultRequest;
import aidl.hardware.dalix.uwb.AoaType;
import aidl.hardware.dalix.uwb.BprfPhrDataRate;
import aidl.hardware.dalix.uwb.DeviceRole;
import aidl.hardware.dalix.uwb.DeviceType;
import aidl.hardware.dalix.uwb.FcsType;
import aidl.hardware.dalix.uwb.FiraStsConfig;
import aidl.hardware.dalix.uwb.MultiNodeMode;
import aidl.hardware.dalix.uwb.PreambleDuration;
import aidl.hardware.dalix.uwb.PrfMode;
import aidl.hardware.dalix.uwb.PsduDataRate;
import aidl.hardware.dalix.uwb.RangingRoundControl;
import aidl.hardware.dalix.uwb.RangingRoundUsage;
import aidl.hardware.dalix.uwb.ResultReportConfig;
import aidl.hardware.dalix.uwb.RframeConfig;
import aidl.hardware.dalix.uwb.UwbAddress;

// The configuration of one FiRa two-way-ranging session.
@VintfStability
parcelable FiraTwrSession {
    int id;
    DeviceType deviceType;
    DeviceRole deviceRole;
    RangingRoundUsage rangingRoundUsage;
    MultiNodeMode multiNodeMode;
    UwbAddress deviceAddress;
    UwbAddress[] destAddressList;
    int initiationTimeMs;
    int slotDurationRstu;
    int slotsPerRangingRound;
    int rangingBlockDurationMs;
    int blockStridingValue;
    int maxRangingRoundRetries;
    boolean isHoppingEnabled;
    boolean isBlockStridingEnabled;
    byte sessionPriority;
    RangingRoundControl rangingRoundControl;
    byte inBandTerminationAttemptCount;
    int channelNumber;
    byte preambleCodeIndex;
    RframeConfig rframeConfig;
    PrfMode prfMode;
    PreambleDuration preambleDuration;
    byte sfdId;
    byte stsSegmentCount;
    PsduDataRate psduDataRate;
    BprfPhrDataRate bprfPhrDataRate;
    FcsType fcsType;
    boolean isTxAdaptivePayloadPowerEnabled;
    AoaType aoaType;
    FiraStsConfig stsConfig;
    int subSessionId;
    // vendorId and staticStsIV are used with static STS only.
    byte[] vendorId;
    byte[] staticStsIV;
    boolean isKeyRotationEnabled;
    byte keyRotationRate;
    AoaResultRequest aoaResultRequest;
    ResultReportConfig resultReportConfig;
}
