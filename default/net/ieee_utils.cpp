#define LOG_TAG "dalix.uwb.IeeeUtils"

#include "net/ieee_utils.h"

#include <linux/netlink.h>
#include <net/if.h>

#include <memory>

#include <android-base/logging.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "ipc_utils.h"
#include "net/nl802154.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace {

using AttributeTable = nlattr* [NL802154_ATTR_MAX + 1];

// Parses the top-level attributes of a message of the family.
bool ParseAttributes(nl_msg* msg, AttributeTable attrs) {
  return genlmsg_parse(nlmsg_hdr(msg), 0, attrs, NL802154_ATTR_MAX,
                       const_cast<nla_policy*>(Nl802154AttributePolicy().data())) == 0;
}

}  // namespace

bool IeeeUtils::Setup() {
  std::unique_ptr<NlSocket> socket = factory_->Create();
  if (!socket) return false;
  family_id_ = socket->Resolve(kNl802154FamilyName);
  if (family_id_ < 0) {
    // No colon after the name here, unlike the other clients' lines.
    LOG(ERROR) << "Setup" << " Generic netlink nl802154 not found.";
    return false;
  }
  return true;
}

bool IeeeUtils::SetIeeeCommand(nl_msg* msg, const char* iface, uint8_t cmd, int flags) {
  genlmsg_put(msg, NL_AUTO_PORT, NL_AUTO_SEQ, family_id_, 0, flags, cmd, 0);
  const unsigned int index = if_nametoindex(iface);
  if (index == 0) {
    PLOG(ERROR) << "SetIeeeCommand: Failed to resolve iface " << iface;
    return false;
  }
  if (nla_put_u32(msg, NL802154_ATTR_IFINDEX, index) != 0) {
    LOG(ERROR) << "SetIeeeCommand: Error creating IEEE message " << iface;
    return false;
  }
  return true;
}

std::vector<DevInfo> IeeeUtils::ListDevices(bool* ok) {
  LOG(INFO) << "ListDevices";
  std::vector<DevInfo> devices;
  UniqueNlMsg msg(LOG_TAG);
  genlmsg_put(msg.get(), NL_AUTO_PORT, NL_AUTO_SEQ, family_id_, 0, NLM_F_DUMP,
              NL802154_CMD_GET_INTERFACE, 0);
  *ok = factory_->SendAndAwaitResponse(
      msg.get(),
      [&devices](nl_msg* reply) {
        AttributeTable attrs = {};
        if (!ParseAttributes(reply, attrs) || attrs[NL802154_ATTR_IFNAME] == nullptr ||
            attrs[NL802154_ATTR_WPAN_PHY] == nullptr) {
          LOG(ERROR) << "operator(): Incorrect attr in NL802154_CMD_GET_INTERFACE dump";
          return;
        }
        devices.push_back(DevInfo{nla_get_string(attrs[NL802154_ATTR_IFNAME]),
                                  nla_get_u32(attrs[NL802154_ATTR_WPAN_PHY])});
      },
      NL802154_CMD_NEW_INTERFACE, LOG_TAG);
  return devices;
}

bool IeeeUtils::GetPhyInfo(const char* iface, PhyInfo* info) {
  LOG(INFO) << "GetPhyInfo";
  UniqueNlMsg msg(LOG_TAG);
  if (!SetIeeeCommand(msg.get(), iface, NL802154_CMD_GET_WPAN_PHY, 0)) return false;
  bool parsed = false;
  const bool sent = factory_->SendAndAwaitResponse(
      msg.get(),
      [info, &parsed](nl_msg* reply) {
        AttributeTable attrs = {};
        if (!ParseAttributes(reply, attrs)) {
          LOG(ERROR) << "operator(): Failed to parse CMD_GET_WPAN_PHY";
          return;
        }
        if (attrs[NL802154_ATTR_WPAN_PHY] == nullptr ||
            attrs[NL802154_ATTR_WPAN_PHY_CAPS] == nullptr) {
          LOG(ERROR) << "operator(): Incorrect attr in CMD_GET_WPAN_PHY response";
          return;
        }
        info->phy_index = nla_get_u32(attrs[NL802154_ATTR_WPAN_PHY]);
        nlattr* caps[NL802154_CAP_ATTR_MAX + 1] = {};
        if (nla_parse_nested(
                caps, NL802154_CAP_ATTR_MAX, attrs[NL802154_ATTR_WPAN_PHY_CAPS],
                const_cast<nla_policy*>(Nl802154CapabilityAttributePolicy().data())) != 0) {
          LOG(ERROR) << "operator(): Failed to parse CMD_GET_WPAN_PHY channels";
          return;
        }
        if (caps[NL802154_CAP_ATTR_CHANNELS] == nullptr) {
          LOG(ERROR) << "operator(): Incorrect NL802154_CAP_ATTR_CHANNELS in CMD_GET_WPAN_PHY";
          return;
        }
        nlattr* page;
        int page_rem;
        nla_for_each_nested(page, caps[NL802154_CAP_ATTR_CHANNELS], page_rem) {
          if (nla_type(page) != kNl802154UwbPage) continue;
          nlattr* channel;
          int channel_rem;
          nla_for_each_nested(channel, page, channel_rem) {
            info->channels.push_back(nla_type(channel));
          }
        }
        parsed = true;
      },
      NL802154_CMD_NEW_WPAN_PHY, LOG_TAG);
  return sent && parsed;
}

bool IeeeUtils::SetPanId(const char* iface, uint16_t pan_id) {
  LOG(INFO) << "SetPanId: Set pan id to " << pan_id;
  UniqueNlMsg msg(LOG_TAG);
  if (!SetIeeeCommand(msg.get(), iface, NL802154_CMD_SET_PAN_ID, 0)) return false;
  if (nla_put_u16(msg.get(), NL802154_ATTR_PAN_ID, pan_id) != 0) {
    LOG(ERROR) << "SetPanId: Error creating IEEE message";
    return false;
  }
  return factory_->SendAndAwaitAck(msg.get(), LOG_TAG);
}

bool IeeeUtils::SetChannel(const char* iface, int channel) {
  LOG(INFO) << "SetChannel: Set channel to " << channel;
  // Compared unsigned so that negative channels are out of range too.
  if (static_cast<unsigned int>(channel) > static_cast<unsigned int>(kNl802154MaxChannel)) {
    return false;
  }
  UniqueNlMsg msg(LOG_TAG);
  if (!SetIeeeCommand(msg.get(), iface, NL802154_CMD_SET_CHANNEL, 0)) return false;
  if (nla_put_u8(msg.get(), NL802154_ATTR_PAGE, kNl802154UwbPage) != 0 ||
      nla_put_u8(msg.get(), NL802154_ATTR_CHANNEL, static_cast<uint8_t>(channel)) != 0) {
    LOG(ERROR) << "SetChannel: Error creating IEEE message";
    return false;
  }
  return factory_->SendAndAwaitAck(msg.get(), LOG_TAG);
}

bool IeeeUtils::SetShortMacAddress(const char* iface, const std::vector<uint8_t>& address) {
  if (address.size() != sizeof(uint16_t)) {
    LOG(ERROR) << "SetShortMacAddress: Incorrect short address, size is " << address.size();
    return false;
  }
  UniqueNlMsg msg(LOG_TAG);
  if (!SetIeeeCommand(msg.get(), iface, NL802154_CMD_SET_SHORT_ADDR, 0)) return false;
  bool converted = false;
  const uint16_t short_address = ToShortAddress(address, &converted);
  if (!converted) {
    LOG(ERROR) << "SetShortMacAddress: Failed to create short address";
    return false;
  }
  if (nla_put_u16(msg.get(), NL802154_ATTR_SHORT_ADDR, short_address) != 0) {
    LOG(ERROR) << "SetShortMacAddress: Error creating IEEE message";
    return false;
  }
  return factory_->SendAndAwaitAck(msg.get(), LOG_TAG);
}

}  // namespace dalix
}  // namespace hardware
