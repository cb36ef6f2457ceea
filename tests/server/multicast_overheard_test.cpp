// What a server hears on the public group: other servers.
#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/wire/frames.h"
#include "server/multicast_script.h"

namespace server {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr Peer kRival{0x0A000003, 7001};

std::string AnnouncementOf(const std::string& name, bool enciphered = false) {
  std::vector<std::uint8_t> frame(200);
  mcftp::Announcement announcement;
  announcement.block_size = 512;
  announcement.file_size = 1;
  announcement.file_name = name;
  std::size_t length = mcftp::EncodeAnnouncement(announcement, frame.data(), frame.size());
  if (enciphered) {
    const mcftp::FixedKey key;
    const mcftp::Blowfish cipher(key.bytes, mcftp::FixedKey::kLength);
    length = mcftp::SealFrame(cipher, frame.data(), length, frame.size());
  }
  return {reinterpret_cast<const char*>(frame.data()), length};
}

class MulticastOverheardTest : public LockStepScript {
 protected:
  MulticastOverheardTest() {
    Add(kName, SomeBytes(2500));
    Begin();
    run_->SetListener([this](const MulticastEvent& event) {
      if (event.kind == MulticastEventKind::kRival) told_.push_back(event.detail);
    });
  }
  void Overhear(const Peer& from, const std::string& bytes) {
    run_->OnOverheard(from, bytes, now_);
  }

  std::vector<std::string> told_;
};

TEST_F(MulticastOverheardTest, TellsOnceOfEachServerThatAnnouncesOnItsGroup) {
  Overhear(kRival, AnnouncementOf("\\Temp\\other.bin"));
  Overhear(kRival, AnnouncementOf("\\Temp\\third.bin"));
  Overhear({kRival.address, 7002}, AnnouncementOf("\\Te\x01mp", /*enciphered=*/true));

  EXPECT_THAT(run_->figures().rivals, ElementsAre(kRival, Peer{kRival.address, 7002}));
  EXPECT_THAT(told_, ElementsAre("10.0.0.3:7001 announces \\Temp\\other.bin on the same group",
                                 "10.0.0.3:7002 announces \\Te?mp on the same group"));
}

TEST_F(MulticastOverheardTest, ItselfAndFramesThatAnnounceNothingAreNoServers) {
  Overhear(kOwn, AnnouncementOf(kName));
  for (const std::string& bytes :
       {std::string(), std::string("\x00", 1), Ack(0), Request(0x11, kName, true),
        AnnouncementOf("x").substr(0, 52), std::string(60'000, '\x20')}) {
    Overhear(kRival, bytes);
  }
  EXPECT_THAT(run_->figures().rivals, IsEmpty());
  EXPECT_EQ(run_->figures().garbage, 0U);
  EXPECT_EQ(run_->figures().frames_received, 0U);
}

TEST_F(MulticastOverheardTest, KeepsSixteenServersApartAndNoMore) {
  for (std::uint16_t port = 1; port <= 1000; ++port) {
    Overhear({kRival.address, port}, AnnouncementOf("x"));
  }
  EXPECT_EQ(run_->figures().rivals.size(), MulticastFigures::kMostRivals);
  EXPECT_EQ(told_.size(), MulticastFigures::kMostRivals);
}

}  // namespace
}  // namespace server
