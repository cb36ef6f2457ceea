// What a device on the host's sockets does not hear, and what stays on it.
#include "net/posix/loss.h"

#include <gtest/gtest.h>

#include <vector>

#include "simulator/net/sockets.h"

namespace test {
namespace {

int Lost(double percent, std::uint64_t seed, int count) {
  sim::DatagramLoss loss(percent, seed);
  int lost = 0;
  for (int i = 0; i < count; ++i) lost += loss.Next() ? 1 : 0;
  return lost;
}

std::vector<bool> Row(std::uint64_t seed) {
  sim::DatagramLoss loss(50, seed);
  std::vector<bool> row;
  for (int i = 0; i < 100; ++i) row.push_back(loss.Next());
  return row;
}

TEST(DatagramLossTest, LosesAboutAsManyAsItIsTold) {
  EXPECT_EQ(Lost(0, 1, 10000), 0);
  EXPECT_EQ(Lost(100, 1, 10000), 10000);
  EXPECT_NEAR(Lost(2, 1, 100000), 2000, 200);
  EXPECT_NEAR(Lost(0.5, 7, 100000), 500, 100);
}

TEST(DatagramLossTest, LosesTheSamePlacesWithTheSameSeed) {
  EXPECT_EQ(Row(7), Row(7));
  EXPECT_NE(Row(7), Row(8));
  EXPECT_NE(Row(0), Row(1));
}

sim::Profile Deaf() {
  sim::Profile profile;
  profile.datagram_loss_percent = 100;
  return profile;
}

class LossThreadsTest : public RealDeviceTest {
 protected:
  LossThreadsTest() : RealDeviceTest(Deaf()) { StartWinsock(); }
};

TEST_F(LossThreadsTest, HearsItselfOnlyWhenAllOfOthersIsLost) {
  sim::Profile profile;
  profile.address = "127.0.0.3";
  sim::Device other(world(), profile, folder() / "other");
  const SOCKET here = Udp();
  ASSERT_EQ(Bind(here, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(here).port;
  ASSERT_EQ(Group(here, CE_IP_ADD_MEMBERSHIP, kGroup), 0);

  RunProgram(other, [port] {
    StartWinsock();
    const SOCKET there = Udp();
    SendTo(there, {kDevice, port}, "lost");
    SendTo(there, {kGroup, port}, "lost too");
    return 0U;
  });
  EXPECT_EQ(Select(here, For::kRead, 0), 0);
  EXPECT_EQ(device().network().datagrams_lost(), 2U);
  SendTo(Udp(), {kDevice, port}, "own");

  EXPECT_EQ(ReceiveText(here), "own");
}

TEST_F(LossThreadsTest, KeepsOnTheDeviceWhatAProgramSendsTo127001) {
  const SOCKET of_the_host = Udp();  // this device has the host's own 127.0.0.1
  ASSERT_EQ(Bind(of_the_host, sim::kAnyAddress), 0);
  const std::uint16_t port = LocalName(of_the_host).port;
  sim::Profile profile;
  profile.address = "127.0.0.3";
  sim::Device other(world(), profile, folder() / "other");

  RunProgram(other, [port] {
    StartWinsock();
    const SOCKET there = Udp();
    EXPECT_EQ(Bind(there, sim::kAnyAddress, port), 0);
    SendTo(Udp(), {kDevice, port}, "stays");
    sim::Endpoint from;
    EXPECT_EQ(ReceiveFrom(there, from), "stays");
    EXPECT_EQ(from.address, kOther);
    return 0U;
  });

  EXPECT_EQ(Select(of_the_host, For::kRead, 0), 0);
}

}  // namespace
}  // namespace test
