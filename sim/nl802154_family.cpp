#include "sim/nl802154_family.h"

#include <errno.h>

#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "net/nl802154.h"
#include "net/unique_nl_msg.h"
#include "sim/responder.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// Puts what the kernel reports about one interface.
bool PutInterface(nl_msg* msg, const WpanDevice& device) {
  if (nla_put_u32(msg, NL802154_ATTR_IFINDEX, device.ifindex) != 0) return false;
  if (!device.config.dump_without_name &&
      nla_put_string(msg, NL802154_ATTR_IFNAME, device.config.name.c_str()) != 0) {
    return false;
  }
  if (!device.config.dump_without_phy &&
      nla_put_u32(msg, NL802154_ATTR_WPAN_PHY, device.config.phy_index) != 0) {
    return false;
  }
  return nla_put_u16(msg, NL802154_ATTR_PAN_ID, device.pan_id) == 0 &&
         nla_put_u16(msg, NL802154_ATTR_SHORT_ADDR, device.short_address) == 0;
}

// The capability nest: one nest per page, typed by the page number, holding
// one flag per supported channel, typed by the channel number.
bool PutCapabilities(nl_msg* msg, const WpanDevice& device) {
  nlattr* caps = nla_nest_start(msg, NL802154_ATTR_WPAN_PHY_CAPS);
  if (caps == nullptr) return false;
  nlattr* channels = nla_nest_start(msg, NL802154_CAP_ATTR_CHANNELS);
  if (channels == nullptr) return false;
  for (const auto& [page, page_channels] : device.config.pages) {
    nlattr* page_nest = nla_nest_start(msg, page);
    if (page_nest == nullptr) return false;
    for (uint8_t channel : page_channels) {
      if (nla_put_flag(msg, channel) != 0) return false;
    }
    nla_nest_end(msg, page_nest);
  }
  nla_nest_end(msg, channels);
  nla_nest_end(msg, caps);
  return true;
}

}  // namespace

void Nl802154Family::HandleRequest(const Request& request, Responder& responder) {
  ++request_count_;
  nlattr* attrs[NL802154_ATTR_MAX + 1] = {};
  if (genlmsg_parse(nlmsg_hdr(request.msg), 0, attrs, NL802154_ATTR_MAX,
                    const_cast<nla_policy*>(Nl802154AttributePolicy().data())) != 0) {
    responder.Refuse(EINVAL);
    return;
  }
  switch (request.cmd) {
    case NL802154_CMD_GET_INTERFACE:
      ListInterfaces(request, attrs, responder);
      return;
    case NL802154_CMD_GET_WPAN_PHY:
      DescribePhy(attrs, responder);
      return;
    case NL802154_CMD_SET_CHANNEL:
      SetChannel(attrs, responder);
      return;
    case NL802154_CMD_SET_PAN_ID:
      SetPanId(attrs, responder);
      return;
    case NL802154_CMD_SET_SHORT_ADDR:
      SetShortAddress(attrs, responder);
      return;
    default:
      responder.Refuse(EOPNOTSUPP);
      return;
  }
}

void Nl802154Family::ListInterfaces(const Request& request, nlattr** attrs,
                                    Responder& responder) {
  std::vector<WpanDevice> devices;
  if (request.IsDump()) {
    devices = devices_->Devices();
  } else {
    // Without a dump the kernel describes the one interface named.
    if (attrs[NL802154_ATTR_IFINDEX] == nullptr) {
      responder.Refuse(EINVAL);
      return;
    }
    std::optional<WpanDevice> device =
        devices_->FindByIndex(nla_get_u32(attrs[NL802154_ATTR_IFINDEX]));
    if (!device) {
      responder.Refuse(ENODEV);
      return;
    }
    devices.push_back(*device);
  }
  for (const WpanDevice& device : devices) {
    UniqueNlMsg reply = responder.NewReply(NL802154_CMD_NEW_INTERFACE);
    if (!PutInterface(reply.get(), device)) {
      responder.Refuse(EMSGSIZE);
      return;
    }
    responder.Reply(reply.get());
  }
}

void Nl802154Family::DescribePhy(nlattr** attrs, Responder& responder) {
  std::optional<WpanDevice> device;
  if (attrs[NL802154_ATTR_IFINDEX] != nullptr) {
    device = devices_->FindByIndex(nla_get_u32(attrs[NL802154_ATTR_IFINDEX]));
  } else if (attrs[NL802154_ATTR_WPAN_PHY] != nullptr) {
    const uint32_t phy = nla_get_u32(attrs[NL802154_ATTR_WPAN_PHY]);
    for (const WpanDevice& candidate : devices_->Devices()) {
      if (candidate.config.phy_index == phy) {
        device = candidate;
        break;
      }
    }
  } else {
    responder.Refuse(EINVAL);
    return;
  }
  if (!device) {
    responder.Refuse(ENODEV);
    return;
  }
  UniqueNlMsg reply = responder.NewReply(NL802154_CMD_NEW_WPAN_PHY);
  if (nla_put_u32(reply.get(), NL802154_ATTR_WPAN_PHY, device->config.phy_index) != 0 ||
      nla_put_u8(reply.get(), NL802154_ATTR_PAGE, device->page) != 0 ||
      nla_put_u8(reply.get(), NL802154_ATTR_CHANNEL, device->channel) != 0 ||
      !PutCapabilities(reply.get(), *device)) {
    responder.Refuse(EMSGSIZE);
    return;
  }
  responder.Reply(reply.get());
}

void Nl802154Family::SetChannel(nlattr** attrs, Responder& responder) {
  if (attrs[NL802154_ATTR_IFINDEX] == nullptr || attrs[NL802154_ATTR_PAGE] == nullptr ||
      attrs[NL802154_ATTR_CHANNEL] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  const int error = devices_->SetChannel(nla_get_u32(attrs[NL802154_ATTR_IFINDEX]),
                                         nla_get_u8(attrs[NL802154_ATTR_PAGE]),
                                         nla_get_u8(attrs[NL802154_ATTR_CHANNEL]));
  if (error != 0) responder.Refuse(error);
}

void Nl802154Family::SetPanId(nlattr** attrs, Responder& responder) {
  if (attrs[NL802154_ATTR_IFINDEX] == nullptr || attrs[NL802154_ATTR_PAN_ID] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  const int error = devices_->SetPanId(nla_get_u32(attrs[NL802154_ATTR_IFINDEX]),
                                       nla_get_u16(attrs[NL802154_ATTR_PAN_ID]));
  if (error != 0) responder.Refuse(error);
}

void Nl802154Family::SetShortAddress(nlattr** attrs, Responder& responder) {
  if (attrs[NL802154_ATTR_IFINDEX] == nullptr || attrs[NL802154_ATTR_SHORT_ADDR] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  const int error = devices_->SetShortAddress(nla_get_u32(attrs[NL802154_ATTR_IFINDEX]),
                                              nla_get_u16(attrs[NL802154_ATTR_SHORT_ADDR]));
  if (error != 0) responder.Refuse(error);
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
