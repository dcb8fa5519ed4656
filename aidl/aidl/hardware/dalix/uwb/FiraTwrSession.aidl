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
