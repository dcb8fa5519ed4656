#define LOG_TAG "dalix.uwb.CccRegionUtils"

#include "net/ccc_region_utils.h"

#include <android-base/logging.h>
#include <netlink/genl/genl.h>

#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {

CccRegionUtils::CccRegionUtils(NlSocketFactory* factory) : factory_(factory) {}

CccRegionUtils::~CccRegionUtils() = default;

void CccRegionUtils::SetMcpsNetId(uint32_t id) { mcps_net_id_ = id; }

bool CccRegionUtils::StartRegionMessage(nl_msg* msg, uint32_t hw_index, uint8_t cmd,
                                        nlattr** testdata) {
  if (mcps_net_id_ == 0) {
    LOG(ERROR) << __func__ << ": MCPS netlink id is not resolved";
    return false;
  }
  if (genlmsg_put(msg, NL_AUTO_PORT, NL_AUTO_SEQ, mcps_net_id_, 0, 0, MCPS802154_CMD_TESTMODE, 0) ==
          nullptr ||
      nla_put_u32(msg, MCPS802154_ATTR_HW, hw_index) != 0) {
    return false;
  }
  *testdata = nla_nest_start(msg, MCPS802154_ATTR_TESTDATA | NLA_F_NESTED);
  return *testdata != nullptr && nla_put_u32(msg, KX7200_TM_ATTR_CMD, cmd) == 0;
}

bool CccRegionUtils::StartCccSession(uint32_t hw_index, uint32_t /*first*/, uint64_t /*timeref*/,
                                     uint8_t channel, uint32_t* u32_param) {
  LOG(INFO) << __func__;
  UniqueNlMsg msg;
  nlattr* testdata = nullptr;
  if (!StartRegionMessage(msg.get(), hw_index, KX7200_TM_CMD_CCC_START_SESSION, &testdata)) {
    return false;
  }
  *u32_param = kCccStartU32Param;
  if (nla_put_u8(msg.get(), KX7200_TM_ATTR_CCC_CHANNEL, channel) != 0 ||
      nla_put_u32(msg.get(), KX7200_TM_ATTR_CCC_U32_PARAM, *u32_param) != 0 ||
      nla_nest_end(msg.get(), testdata) != 0) {
    return false;
  }
  // The driver's verdict is logged but not acted on: a reply is success.
  bool accepted = false;
  bool replied = factory_->SendAndAwaitResponse(
      msg.get(), [&accepted](nl_msg* reply) { accepted = ParseTestModeCmdResponse(reply); },
      MCPS802154_CMD_TESTMODE);
  return replied;
}

bool CccRegionUtils::ParseTestModeCmdResponse(nl_msg* msg) {
  LOG(INFO) << __func__;
  nlattr* attrs[MCPS802154_ATTR_MAX + 1] = {};
  if (genlmsg_parse(nlmsg_hdr(msg), 0, attrs, MCPS802154_ATTR_MAX,
                    kMcpsTestModeReplyPolicy.data()) != 0) {
    LOG(ERROR) << __func__ << ": Incorrect response";
    return false;
  }
  if (attrs[MCPS802154_ATTR_TESTDATA] == nullptr) {
    LOG(ERROR) << __func__ << ": Missing MCPS802154_ATTR_TESTDATA";
    return false;
  }
  nlattr* testdata[KX7200_TM_ATTR_MAX + 1] = {};
  if (nla_parse_nested(testdata, KX7200_TM_ATTR_MAX, attrs[MCPS802154_ATTR_TESTDATA],
                       kMcpsTestDataReplyPolicy.data()) != 0) {
    LOG(ERROR) << __func__ << ": Failed to parse MCPS802154_ATTR_TESTDATA";
    return false;
  }
  if (testdata[KX7200_TM_ATTR_CCC_CMD_RC] == nullptr) {
    LOG(ERROR) << __func__ << ": Missing KX7200_TM_ATTR_CCC_CMD_RC";
    return false;
  }
  // The driver reports success with a non-zero code.
  if (nla_get_u8(testdata[KX7200_TM_ATTR_CCC_CMD_RC]) != 0) return true;
  LOG(ERROR) << __func__ << ": Error on the command";
  return false;
}

}  // namespace dalix
}  // namespace hardware
