#pragma once

// The generated interface library of the HAL, as the service uses it. The
// platform's generator puts the package under a leading "aidl" namespace;
// the alias lets the service name the types aidl::hardware::dalix::uwb::...
// on every target.

#include <aidl/aidl/hardware/dalix/uwb/AoaResultRequest.h>
#include <aidl/aidl/hardware/dalix/uwb/AoaType.h>
#include <aidl/aidl/hardware/dalix/uwb/BnCccController.h>
#include <aidl/aidl/hardware/dalix/uwb/BnFiraController.h>
#include <aidl/aidl/hardware/dalix/uwb/BnSimpleRangingController.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwb.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbIface.h>
#include <aidl/aidl/hardware/dalix/uwb/BprfPhrDataRate.h>
#include <aidl/aidl/hardware/dalix/uwb/DeviceRole.h>
#include <aidl/aidl/hardware/dalix/uwb/DeviceType.h>
#include <aidl/aidl/hardware/dalix/uwb/FcsType.h>
#include <aidl/aidl/hardware/dalix/uwb/FiraAntennaMeasurement.h>
#include <aidl/aidl/hardware/dalix/uwb/FiraCapabilities.h>
#include <aidl/aidl/hardware/dalix/uwb/FiraRangingData.h>
#include <aidl/aidl/hardware/dalix/uwb/FiraStsConfig.h>
#include <aidl/aidl/hardware/dalix/uwb/FiraTwrMeasurement.h>
#include <aidl/aidl/hardware/dalix/uwb/FiraTwrSession.h>
#include <aidl/aidl/hardware/dalix/uwb/IFiraSessionCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/IFiraStateCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/ISimpleRangingCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwbClientCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/MeasurementReportType.h>
#include <aidl/aidl/hardware/dalix/uwb/MultiNodeMode.h>
#include <aidl/aidl/hardware/dalix/uwb/PreambleDuration.h>
#include <aidl/aidl/hardware/dalix/uwb/PrfMode.h>
#include <aidl/aidl/hardware/dalix/uwb/PsduDataRate.h>
#include <aidl/aidl/hardware/dalix/uwb/RangingRequest.h>
#include <aidl/aidl/hardware/dalix/uwb/RangingResult.h>
#include <aidl/aidl/hardware/dalix/uwb/RangingRoundControl.h>
#include <aidl/aidl/hardware/dalix/uwb/RangingRoundUsage.h>
#include <aidl/aidl/hardware/dalix/uwb/ResultReportConfig.h>
#include <aidl/aidl/hardware/dalix/uwb/RframeConfig.h>
#include <aidl/aidl/hardware/dalix/uwb/UwbAddress.h>
#include <aidl/aidl/hardware/dalix/uwb/UwbCapabilities.h>

namespace aidl::hardware::dalix {
namespace uwb = ::aidl::aidl::hardware::dalix::uwb;
}  // namespace aidl::hardware::dalix
