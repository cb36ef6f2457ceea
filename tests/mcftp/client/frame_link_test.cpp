#include "mcftp/frame_link.h"

#include <gmock/gmock.h>

#include "mcftp/client/frames.h"
#include "mcftp/wire/frames.h"
#include "net/virtual/virtual_server.h"
#include "support/device_test.h"
// The platform's own names come last.
#include <coredll.h>

namespace {

using mcftp::FileInHand;
using mcftp::Frame;
using mcftp::FrameLink;
using test::Hex;
using test::ToHex;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

sim::Profile ClientProfile() {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  return profile;
}

class FrameLinkTest : public DeviceTest {
 protected:
  FrameLinkTest()
      : DeviceTest(ClientProfile()),
        server_(world(), {0x0A000002, 7001},
                [this](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                  sent_.push_back(ToHex(bytes));
                }) {
    EXPECT_TRUE(link_.MakeCipher());
    EXPECT_TRUE(link_.network().Start());
    EXPECT_TRUE(link_.public_endpoint().Create());
    EXPECT_TRUE(link_.public_endpoint().Bind(7000));
  }

  bool Receive(const std::string& bytes, const FileInHand& file = {}) {
    server_.Send({0x0A000001, 7000}, bytes);
    return link_.Receive(10, file, frame_);
  }
  std::vector<std::string> Sent() {
    Sleep(1);
    return std::exchange(sent_, {});
  }
  bool SendAck(std::uint16_t block) {
    return link_.Send(
        mcftp::EncodeAck({block, false}, link_.send_buffer(), FrameLink::kSendBuffer));
  }

  FrameLink link_;
  Frame frame_;
  std::vector<std::string> sent_;
  sim::VirtualPort server_;
};

TEST_F(FrameLinkTest, SendsToWhomeverItHasHeard) {
  ASSERT_TRUE(Receive(test::kOackPassive));

  EXPECT_EQ(link_.server_text().view(), "10.0.0.2");
  EXPECT_TRUE(SendAck(5));
  EXPECT_THAT(Sent(), ElementsAre("00 40 00 00 00 05"));
}

TEST_F(FrameLinkTest, SendsTheLastFrameAgainWithItsResendFlag) {
  ASSERT_TRUE(Receive(test::kOackPassive));
  ASSERT_TRUE(SendAck(5));

  EXPECT_TRUE(link_.Resend());
  EXPECT_TRUE(link_.Resend());

  EXPECT_THAT(Sent(), ElementsAre("00 40 00 00 00 05", "00 42 00 00 00 05", "00 42 00 00 00 05"));
}

TEST_F(FrameLinkTest, DoesNotEncipherTwiceWhatItSendsAgain) {
  ASSERT_TRUE(Receive(Hex("80 74 7d 62 39 a1 3a 38 a4 d8")));
  EXPECT_TRUE(link_.enciphering());
  ASSERT_TRUE(SendAck(5));

  EXPECT_TRUE(link_.Resend());

  EXPECT_THAT(Sent(),
              ElementsAre("80 40 5b 7c ed 9d cb 76 89 c0", "80 42 5b 7c ed 9d cb 76 89 c0"));
}

TEST_F(FrameLinkTest, EnciphersAsItIsToldUntilTheFirstFrameComes) {
  ASSERT_TRUE(Receive(test::kOackPassive));
  link_.set_enciphering(true);
  EXPECT_TRUE(SendAck(5));
  EXPECT_THAT(Sent(), ElementsAre("80 40 5b 7c ed 9d cb 76 89 c0"));

  ASSERT_TRUE(Receive(test::kOackPassive));
  EXPECT_TRUE(SendAck(5));
  EXPECT_THAT(Sent(), ElementsAre("00 40 00 00 00 05"));
}

TEST_F(FrameLinkTest, HasNothingToSendAgainAtFirstOrBehindAFailure) {
  ASSERT_TRUE(Receive(test::kOackPassive));
  EXPECT_FALSE(link_.Resend());
  ASSERT_TRUE(SendAck(5));
  EXPECT_FALSE(link_.Send(0)) << "a frame that could not be built";
  EXPECT_FALSE(link_.Resend());
  EXPECT_THAT(Sent(), ElementsAre("00 40 00 00 00 05"));
}

TEST_F(FrameLinkTest, TakesFramesForServersWhateverTheirLength) {
  EXPECT_TRUE(Receive(Hex("00 40"))) << "it is no frame that a client waits for, but it is one";
  EXPECT_TRUE(frame_.header.Is(mcftp::Opcode::kAck));
  EXPECT_TRUE(Receive(Hex("00 10")));
  EXPECT_TRUE(Receive(Hex("00 f0")));
  EXPECT_FALSE(Receive(Hex("00")));
}

TEST_F(FrameLinkTest, LeavesTheServerAsItIsForFramesThatItDrops) {
  ASSERT_TRUE(Receive(test::kOackPassive));
  sim::VirtualPort stranger(world(), {0x0A000009, 7001},
                            [](sim::VirtualPort&, const sim::Endpoint&, std::string_view) {});
  const FileInHand file = {"\\Temp\\a.bin", 512, 3};
  for (const std::string& bytes : {test::Announcement({}), test::Data(1, 512), Hex("00 70 00 00"),
                                   Hex("10 70 00 00 1b 58 ef 01 01 02")}) {
    stranger.Send({0x0A000001, 7000}, bytes);
    EXPECT_FALSE(link_.Receive(10, file, frame_)) << ToHex(bytes.substr(0, 2));
  }
  EXPECT_EQ(link_.server_text().view(), "10.0.0.2");

  EXPECT_TRUE(Receive(test::Data(3, 512), file));
  EXPECT_EQ(frame_.data.block, 3);
  EXPECT_FALSE(Receive(test::Data(4, 512), file));
}

TEST_F(FrameLinkTest, TellsWhichPrivateGroupItIsIn) {
  EXPECT_FALSE(link_.private_group_joined());
  EXPECT_TRUE(link_.JoinPrivateGroup(0xEF010102, 7000));
  EXPECT_TRUE(link_.private_group_joined());
  EXPECT_EQ(link_.private_group_text().view(), "239.1.1.2");
  EXPECT_FALSE(link_.JoinPrivateGroup(0x0A000009, 7000));
  EXPECT_FALSE(link_.private_group_joined()) << "the one before was left";
}

}  // namespace
