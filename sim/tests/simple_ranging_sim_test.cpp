#include "sim/simple_ranging_sim.h"

#include <gtest/gtest.h>

#include "looper/looper_backed_event_loop.h"
#include "net/mcps802154.h"
#include "net/mcps_utils.h"
#include "sim/mcps_family.h"
#include "sim/sim_nl_socket_factory.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// The service's McpsUtils installing requests on the simulated driver.
TEST(SimpleRangingSimTest, RequestsNeedTheSimpleRangingScheduler) {
  RadioStore radios;
  World world;
  McpsFamily family(&radios);
  DriverSimulator simulator;
  SimpleRangingSim ranging(&simulator, &radios, nullptr, &world);
  family.SetCommandHandler(MCPS802154_CMD_SET_RANGING_REQUESTS,
                           [&](auto& request, nlattr** attrs, auto& responder) {
                             ranging.SetRangingRequests(request, attrs, responder);
                           });
  simulator.RegisterFamily(kMcpsFamilyName, &family);
  ASSERT_TRUE(simulator.Start());
  LooperBackedEventLoop loop;
  SimNlSocketFactory factory(&loop, simulator.port());
  McpsUtils mcps(&factory);
  ASSERT_TRUE(mcps.Start());
  mcps.SubscribeRangingResults([](const McpsUtils::RangingResult&) {});
  McpsUtils::RangingRequest request;
  request.id = 3;
  request.parameter = -5;
  request.peerAddress = 0x0102030405060708;

  radios.AddRadio(1, 1u);
  EXPECT_FALSE(mcps.SetRangingRequests(1, {request}));
  radios.SetScheduler(1, kMcpsSchedulerSimpleRanging, 16, 0, {});
  EXPECT_TRUE(mcps.SetRangingRequests(1, {request, request}));
  std::vector<SimpleRangingSim::Request> installed = ranging.Installed(1);
  simulator.Stop();  // before |ranging| goes: its reports run on the simulator
  ASSERT_EQ(installed.size(), 2u);
  EXPECT_EQ(installed[1].id, 3u);
  EXPECT_EQ(installed[1].parameter, static_cast<uint32_t>(-5));
  EXPECT_EQ(installed[1].peer, 0x0102030405060708u);
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
