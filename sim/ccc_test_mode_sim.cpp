#include "sim/ccc_test_mode_sim.h"

#include <cerrno>

#include <netlink/genl/genl.h>

#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace sim {

bool CccTestModeSim::EncodeTestModeReply(nl_msg* msg, uint32_t hw_index,
                                         std::optional<uint8_t> return_code) {
  if (nla_put_u32(msg, MCPS802154_ATTR_HW, hw_index) != 0) return false;
  nlattr* testdata = nla_nest_start(msg, MCPS802154_ATTR_TESTDATA | NLA_F_NESTED);
  // The command is echoed, so the test data is there even without a code.
  if (testdata == nullptr ||
      nla_put_u32(msg, KX7200_TM_ATTR_CMD, KX7200_TM_CMD_CCC_START_SESSION) != 0) {
    return false;
  }
  if (return_code && nla_put_u8(msg, KX7200_TM_ATTR_CCC_CMD_RC, *return_code) != 0) return false;
  return nla_nest_end(msg, testdata) == 0;
}

void CccTestModeSim::TestMode(const Request& /*request*/, nlattr** attrs, Responder& responder) {
  nlattr* fields[KX7200_TM_ATTR_MAX + 1] = {};
  if (attrs[MCPS802154_ATTR_HW] == nullptr || attrs[MCPS802154_ATTR_TESTDATA] == nullptr ||
      nla_parse_nested(fields, KX7200_TM_ATTR_MAX, attrs[MCPS802154_ATTR_TESTDATA],
                       kMcpsTestDataRequestPolicy.data()) != 0 ||
      fields[KX7200_TM_ATTR_CMD] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  const uint32_t hw_index = nla_get_u32(attrs[MCPS802154_ATTR_HW]);
  if (!radios_->HasRadio(hw_index)) {
    responder.Refuse(ENODEV);
    return;
  }
  if (nla_get_u32(fields[KX7200_TM_ATTR_CMD]) != KX7200_TM_CMD_CCC_START_SESSION) {
    responder.Refuse(EOPNOTSUPP);
    return;
  }
  if (fields[KX7200_TM_ATTR_CCC_CHANNEL] == nullptr ||
      fields[KX7200_TM_ATTR_CCC_U32_PARAM] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  std::optional<uint8_t> code;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    starts_.push_back({hw_index, nla_get_u8(fields[KX7200_TM_ATTR_CCC_CHANNEL]),
                       nla_get_u32(fields[KX7200_TM_ATTR_CCC_U32_PARAM])});
    code = return_code_;
  }
  UniqueNlMsg reply = responder.NewReply(MCPS802154_CMD_TESTMODE);
  if (!EncodeTestModeReply(reply.get(), hw_index, code)) {
    responder.Refuse(EMSGSIZE);
    return;
  }
  responder.Reply(reply.get());
}

void CccTestModeSim::SetReturnCode(std::optional<uint8_t> code) {
  std::lock_guard<std::mutex> lock(mutex_);
  return_code_ = code;
}

std::vector<CccTestModeSim::Start> CccTestModeSim::Starts() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return starts_;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
