///////////////////////////////////////////////////////////////////////////////
// THIS FILE IS IMMUTABLE. DO NOT EDIT IN ANY CASE.                          //
///////////////////////////////////////////////////////////////////////////////

// This file is a snapshot of an AIDL file. Do not edit it manually. There are
// two cases:
// 1). this is a frozen version file - do not edit this in any case.
// 2). this is a 'current' file. If you make a backwards compatible change to
//     the interface (from the latest frozen version), the build system will
//     prompt you to update this file with `m <name>-update-api`.
//
// You must not make a backward incompatible change to any AIDL file built
// with the aidl_interface module type with versions property set. The module
// type is used to build AIDL files in a way that they can be used across
// independently updatable components of the system. If a device is shipped
// with such a backward incompatible change, it has a high risk of breaking
// later when a module using the interface is updated, e.g., Mainline modules.

package aidl.hardware.dalix.uwb;

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
