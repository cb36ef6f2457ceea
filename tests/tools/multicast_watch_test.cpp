#include "tools/multicast_watch.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"

namespace tools {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// What a device with one transfer sends and receives.
class MulticastWatchTest : public ::testing::Test {
 protected:
  void Announce(const std::string& file, std::uint32_t size, const std::string& masks = "") {
    mcftp::Announcement announcement;
    announcement.block_size = 100;
    announcement.file_size = size;
    announcement.file_name = file;
    announcement.masks = masks;
    See(false, mcftp::EncodeAnnouncement(announcement, frame_, sizeof frame_));
  }
  void Request(const std::string& file) {
    See(true, mcftp::EncodeReadRequest({false, 0, file}, frame_, sizeof frame_));
  }
  void Give(mcftp::Role role) {
    See(false, mcftp::EncodeOptionAck({role, 7000, 0xEF010102}, frame_, sizeof frame_));
  }
  void Block(std::uint16_t number) {
    const std::uint8_t bytes[100] = {};
    See(false, mcftp::EncodeData({100, number, bytes}, frame_, sizeof frame_));
  }
  void Ack(std::uint16_t number) {
    See(true, mcftp::EncodeAck({number, false}, frame_, sizeof frame_));
  }
  void Nak(std::uint16_t number) { See(true, mcftp::EncodeNak({number}, frame_, sizeof frame_)); }

  void See(bool sent, std::size_t length) {
    ASSERT_NE(length, 0U);
    if (enciphered_) length = mcftp::SealFrame(cipher_, frame_, length, sizeof frame_);
    SeeBytes(sent, {reinterpret_cast<const char*>(frame_), length});
  }
  void SeeBytes(bool sent, std::string_view bytes) {
    watch_.See({sent, {0x7F000002, 7001}, {0x7F000001, 7000}, bytes});
  }

  std::vector<std::string> Steps() {
    std::vector<std::string> steps;
    for (const ReceptionEvent& event : watch_.TakeEvents()) {
      steps.push_back(std::string(NameOf(event.step)) + " " + event.reception.file);
    }
    return steps;
  }

  const mcftp::Blowfish cipher_{mcftp::FixedKey().bytes, mcftp::FixedKey::kLength};
  bool enciphered_ = false;
  std::uint8_t frame_[2048] = {};
  MulticastWatch watch_;
};

TEST_F(MulticastWatchTest, FollowsAFileFromItsAnnouncementToItsLastBlock) {
  Announce("\\a.bin", 400);
  Announce("\\a.bin", 400);
  Request("\\a.bin");
  Give(mcftp::Role::kPassive);
  Give(mcftp::Role::kAckMaster);
  Ack(0);
  for (const std::uint16_t block : {1, 2, 2, 4}) Block(block);

  const Reception now = watch_.reception();
  EXPECT_EQ(now.file, "\\a.bin");
  EXPECT_TRUE(now.under_way);
  EXPECT_EQ(FormatBlocks(now), "ack master [##.#] 3/4");
  EXPECT_EQ(now.twice, 1U);
  Block(3);
  Ack(4);
  Ack(4);

  EXPECT_THAT(Steps(), ElementsAre("announced \\a.bin", "requested \\a.bin", "role \\a.bin",
                                   "received \\a.bin"));
  EXPECT_THAT(Steps(), IsEmpty()) << "events are given once";
  EXPECT_FALSE(watch_.reception().under_way);
  EXPECT_EQ(watch_.totals().files, 1U);
  EXPECT_EQ(watch_.totals().blocks, 4U);
  EXPECT_EQ(watch_.totals().twice, 1U);
}

TEST_F(MulticastWatchTest, SeesThroughTheCipher) {
  enciphered_ = true;
  Announce("\\a.bin", 100);
  Request("\\a.bin");
  Give(mcftp::Role::kNakMaster);
  Block(1);
  Nak(1);

  EXPECT_THAT(Steps(), ElementsAre("announced \\a.bin", "requested \\a.bin", "role \\a.bin",
                                   "received \\a.bin"));
}

TEST_F(MulticastWatchTest, ShowsAFileThatTheDeviceDoesNotAskFor) {
  Announce("\\other.bin", 100, "MV41*");
  Announce("\\a.bin", 100);
  Request("\\a.bin");

  const auto events = watch_.TakeEvents();
  ASSERT_EQ(events.size(), 3U);
  EXPECT_EQ(ToLine(events[0]), "multicast: \\other.bin is announced for MV41*, 1 blocks");
  EXPECT_EQ(ToJson(events[0]).at("masks"), "MV41*");
  EXPECT_EQ(ToLine(events[2]), "multicast: asked for \\a.bin");
}

TEST_F(MulticastWatchTest, TellsOfAnErrorThatTheDeviceReports) {
  Announce("\\a.bin", 100);
  Request("\\a.bin");
  See(true, mcftp::EncodeError({64, "Overrun:6750:120"}, frame_, sizeof frame_));

  EXPECT_EQ(ToLine(watch_.TakeEvents().back()), "multicast: reported error 64 Overrun:6750:120");
}

TEST_F(MulticastWatchTest, DrawsALargeFileInSixteenParts) {
  Announce("\\a.bin", 100 * 1600);
  Request("\\a.bin");
  for (std::uint16_t block = 1; block <= 850; ++block) Block(block);
  for (std::uint16_t block = 1501; block <= 1549; ++block) Block(block);
  for (std::uint16_t block = 1401; block <= 1450; ++block) Block(block);

  EXPECT_EQ(watch_.reception().map, "########+.....+-");
}

TEST_F(MulticastWatchTest, PassesOverWhatIsNoFrame) {
  Announce("\\a.bin", 100);
  Request("\\a.bin");
  static_cast<void>(watch_.TakeEvents());
  Block(2);  // of one
  for (std::size_t length = 0; length < 70; ++length) {
    for (int second = 0; second < 256; second += 4) {
      std::string frame(length, '\0');
      if (length > 1) frame[1] = static_cast<char>(second);
      SeeBytes(length % 2 == 0, frame);
      if (length > 0) frame[0] = '\x80';
      SeeBytes(length % 2 == 0, frame);
    }
  }

  EXPECT_EQ(watch_.reception().held, 0U);
  EXPECT_EQ(watch_.totals().files, 0U);
}

}  // namespace
}  // namespace tools
