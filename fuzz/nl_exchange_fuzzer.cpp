// The response and acknowledgement exchanges of one socket, and the
// factory's one-shots, against a hostile driver: whatever arrives, each
// exchange ends with a verdict and hands the callback only whole messages.
#include <cstddef>
#include <cstdint>
#include <memory>

#include <android-base/logging.h>
#include <netlink/genl/genl.h>

#include "fuzz/scripted_driver.h"
#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"

using hardware::dalix::NlSocket;
using hardware::dalix::UniqueNlMsg;
using hardware::dalix::fuzz::ScriptedDriver;

namespace {

UniqueNlMsg Request(uint8_t cmd) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), NL_AUTO_PORT, NL_AUTO_SEQ, 0x1A, 0, 0, cmd, 1);
  return msg;
}

// What a handler may rely on: the message it is given is all there.
void CheckWhole(nl_msg* msg) {
  const nlmsghdr* header = nlmsg_hdr(msg);
  CHECK(header->nlmsg_len >= NLMSG_LENGTH(GENL_HDRLEN));
  CHECK_EQ(genlmsg_hdr(const_cast<nlmsghdr*>(header))->cmd, hardware::dalix::MCPS802154_CMD_NEW_HW);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static ScriptedDriver driver;
  driver.Load(data, size);
  std::shared_ptr<NlSocket> socket = driver.factory()->Create();
  if (!socket) return 0;
  // Several exchanges on one socket: what one leaves unread meets the next.
  UniqueNlMsg get = Request(hardware::dalix::MCPS802154_CMD_GET_HW);
  socket->SendAndAwaitResponse(get.get(), CheckWhole, hardware::dalix::MCPS802154_CMD_NEW_HW);
  UniqueNlMsg set = Request(hardware::dalix::MCPS802154_CMD_SET_SCHEDULER);
  socket->SendAndAwaitAck(set.get(), [](nl_msg*) { return NL_SKIP; });
  UniqueNlMsg again = Request(hardware::dalix::MCPS802154_CMD_GET_HW);
  socket->SendAndAwaitResponse(again.get(), CheckWhole, hardware::dalix::MCPS802154_CMD_NEW_HW);
  UniqueNlMsg one_shot = Request(hardware::dalix::MCPS802154_CMD_SET_SCHEDULER);
  driver.factory()->SendAndAwaitAck(one_shot.get(), "dalix.fuzz");
  return 0;
}
