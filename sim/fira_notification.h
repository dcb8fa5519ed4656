#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "net/fira_region.h"
#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace sim {

// Angle data of one antenna pair, in the notification's raw units.
struct FiraAoaData {
  std::optional<uint8_t> antenna_pair;
  std::optional<int16_t> first_angle;
  std::optional<uint8_t> figure_of_merit;
  std::optional<int16_t> second_angle;
};

// One measurement nest. Every attribute is optional, so that tests can leave
// out what a driver must send.
struct FiraMeasurementData {
  std::optional<uint16_t> short_address;
  bool stopped = false;
  std::optional<uint8_t> status;
  bool line_of_sight = false;
  bool non_line_of_sight = false;
  std::optional<uint32_t> distance_cm;
  std::optional<FiraAoaData> aoa;
  std::optional<FiraAoaData> aoa_azimuth;
  std::optional<FiraAoaData> aoa_elevation;
  std::optional<int16_t> azimuth;
  std::optional<int16_t> elevation;
  std::optional<uint8_t> azimuth_fom;
  std::optional<uint8_t> elevation_fom;
};

// A FiRa session notification as the driver sends it. The framing fields can
// be set to what no driver sends (another command, region or call id).
struct FiraNotificationData {
  uint8_t cmd = MCPS802154_CMD_CALL_REGION;
  std::optional<uint32_t> hw_index;
  std::optional<std::string> region = kMcpsRegionFira;
  std::optional<uint32_t> call = FIRA_CALL_SESSION_NOTIFICATION;
  bool has_call_params = true;
  std::optional<uint32_t> session_id;
  // Ranging data: its stopped marker, or a result.
  bool stopped = false;
  std::optional<uint64_t> timestamp_ns;
  std::optional<uint32_t> index;
  std::optional<std::vector<FiraMeasurementData>> measurements;
};

// The driver's encoder of session notifications: writes into the empty
// |msg| a message of |family_id| with sequence 0, its nests without
// NLA_F_NESTED as the driver puts them. Used by the simulated FiRa region,
// the tests, fuzz seeds and benchmarks. False if it does not fit in |msg|.
bool EncodeFiraNotification(nl_msg* msg, int family_id, const FiraNotificationData& data);

// Raw units of the notification, from radians and 0..1 confidence, rounded
// and clamped to what the attribute holds.
int16_t FiraAzimuthRaw(double radians);
int16_t FiraElevationRaw(double radians);
uint8_t FiraFigureOfMeritRaw(double confidence);

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
