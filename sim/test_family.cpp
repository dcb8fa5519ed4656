#include "sim/test_family.h"

#include <cerrno>

#include <netlink/genl/genl.h>

#include "sim/test_family_defs.h"

namespace hardware {
namespace dalix {
namespace sim {

TestFamily::TestFamily(DriverSimulator* simulator) : simulator_(simulator), value_(0) {}

UniqueNlMsg TestFamily::NewRequest(int family_id, uint8_t cmd) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), NL_AUTO_PORT, NL_AUTO_SEQ, family_id, 0, 0, cmd, kTestFamilyVersion);
  return msg;
}

void TestFamily::HandleRequest(const Request& request, Responder& responder) {
  nlattr* attrs[kTestAttrMax + 1];
  if (genlmsg_parse(nlmsg_hdr(request.msg), 0, attrs, kTestAttrMax, kTestPolicy) < 0) {
    responder.Refuse(EINVAL);
    return;
  }
  switch (request.cmd) {
    case kTestCmdSet:
      if (!attrs[kTestAttrValue]) {
        responder.Refuse(EINVAL);
        return;
      }
      value_ = nla_get_u32(attrs[kTestAttrValue]);
      return;
    case kTestCmdGet: {
      UniqueNlMsg reply = responder.NewReply(kTestCmdValue);
      nla_put_u32(reply.get(), kTestAttrValue, value_);
      responder.Reply(reply.get());
      return;
    }
    case kTestCmdList: {
      uint32_t count = attrs[kTestAttrCount] ? nla_get_u32(attrs[kTestAttrCount]) : 0;
      for (uint32_t i = 1; i <= count; ++i) {
        UniqueNlMsg entry = responder.NewReply(kTestCmdValue);
        nla_put_u32(entry.get(), kTestAttrValue, i);
        responder.Reply(entry.get());
      }
      return;
    }
    case kTestCmdSubscribe: {
      if (!attrs[kTestAttrCount]) {
        responder.Refuse(EINVAL);
        return;
      }
      uint32_t count = nla_get_u32(attrs[kTestAttrCount]);
      uint32_t port = request.port;
      int family_id = request.family_id;
      // Posted, so that the events follow the acknowledgement.
      simulator_->Post([this, count, port, family_id] {
        for (uint32_t i = 1; i <= count; ++i) {
          UniqueNlMsg event = DriverSimulator::NewEvent(family_id, kTestCmdValue);
          nla_put_u32(event.get(), kTestAttrValue, i);
          simulator_->SendEvent(port, event.get());
        }
      });
      return;
    }
    default:
      responder.Refuse(EOPNOTSUPP);
      return;
  }
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
