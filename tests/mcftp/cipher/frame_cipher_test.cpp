#include "mcftp/cipher/frame_cipher.h"

#include <gtest/gtest.h>

#include "mcftp/cipher/fixed_key.h"
#include "mcftp/golden_frames.h"
#include "mcftp/wire/frames.h"
#include "support/hex.h"

namespace {

using mcftp::Blowfish;
using test::Bytes;
using test::Hex;
using test::ToHex;

class FrameCipherTest : public testing::Test {
 protected:
  /// Seals within a buffer of exactly the room that is needed.
  Bytes Seal(Bytes frame) {
    const std::size_t length = frame.size();
    frame.resize(mcftp::EncipheredLength(length), 0xCD);
    frame.resize(mcftp::SealFrame(cipher_, frame.data(), length, frame.size()));
    return frame;
  }

  mcftp::FixedKey key_;
  Blowfish cipher_{key_.bytes, mcftp::FixedKey::kLength};
};

TEST_F(FrameCipherTest, SealsAndOpensGoldenFrames) {
  const struct {
    const char* clear;
    const char* enciphered;
  } kCases[] = {{golden::kAnnouncement, golden::kEncipheredAnnouncement},
                {golden::kMaskedAnnouncement, golden::kEncipheredMaskedAnnouncement},
                {golden::kEmptyLastFile, golden::kEncipheredEmptyLastFile},
                {golden::kReadRequest, golden::kEncipheredReadRequest},
                {golden::kOackPassive, golden::kEncipheredOackPassive},
                {golden::kOackAckMaster, golden::kEncipheredOackAckMaster},
                {golden::kOackNakMaster, golden::kEncipheredOackNakMaster},
                {golden::kData, golden::kEncipheredData},
                {golden::kAck0, golden::kEncipheredAck0},
                {golden::kAck5, golden::kEncipheredAck5},
                {golden::kDuplicateAck5, golden::kEncipheredDuplicateAck5},
                {golden::kNak2, golden::kEncipheredNak2},
                {golden::kOverrun, golden::kEncipheredOverrun},
                {golden::kUnknownTransfer, golden::kEncipheredUnknownTransfer},
                {golden::kDiskFull, golden::kEncipheredDiskFull}};
  for (const auto& c : kCases) {
    Bytes frame = Seal(Hex(c.clear));
    EXPECT_EQ(ToHex(frame), c.enciphered);

    EXPECT_TRUE(mcftp::OpenFrame(cipher_, frame.data(), frame.size()));
    mcftp::SetEncryptedFlag(frame.data(), false);
    Bytes expected = Hex(c.clear);
    expected.resize(frame.size(), 0);
    EXPECT_EQ(frame, expected) << "the padding stays";
  }
}

TEST_F(FrameCipherTest, SealsAnAckOfThisKeyAndOfAnother) {
  const Bytes counting =
      Hex("00010203 04050607 08090a0b 0c0d0e0f 10111213 14151617 18191a1b 1c1d1e1f");
  const Blowfish other(counting.data(), counting.size());
  Bytes frame = Hex("00 40 00 00 00 05 cd cd cd cd");
  EXPECT_EQ(mcftp::SealFrame(other, frame.data(), 6, frame.size()), 10U);
  EXPECT_EQ(ToHex(frame), "80 40 ea 85 c8 a3 b3 68 8a 1c");
}

TEST_F(FrameCipherTest, KeepsTheOtherFlagsAndClearsTheReservedBits) {
  const Bytes frame = Seal(Hex("71 42 00 00 00 05"));
  EXPECT_EQ(frame[0], 0x81);
  EXPECT_EQ(frame[1], 0x42);
}

TEST_F(FrameCipherTest, SealsNothingThatDoesNotFit) {
  const Bytes clear = Hex("00 40 00 00 00 05 cd cd cd");
  Bytes frame = clear;
  EXPECT_EQ(mcftp::SealFrame(cipher_, frame.data(), 6, 9), 0U);
  EXPECT_EQ(mcftp::SealFrame(cipher_, frame.data(), 1, 9), 0U);
  EXPECT_EQ(mcftp::SealFrame(cipher_, frame.data(), 0, 9), 0U);
  EXPECT_EQ(frame, clear);
}

TEST_F(FrameCipherTest, SealsAHeaderAlone) {
  EXPECT_EQ(Seal(Hex("00 40")), Hex("80 40"));
}

TEST_F(FrameCipherTest, LeavesAClearFrameAsItIs) {
  Bytes frame = Hex(golden::kOverrun);
  EXPECT_TRUE(mcftp::OpenFrame(cipher_, frame.data(), frame.size()));
  EXPECT_EQ(frame, Hex(golden::kOverrun));
}

TEST_F(FrameCipherTest, DropsABodyThatIsNoMultipleOfWholeBlocks) {
  for (std::size_t length = 0; length <= 64; ++length) {
    Bytes frame(length, 0x80);
    EXPECT_EQ(mcftp::OpenFrame(cipher_, frame.data(), length), length >= 2 && (length - 2) % 8 == 0)
        << length;
  }
}

TEST_F(FrameCipherTest, KnowsHowLongAFrameBecomes) {
  EXPECT_EQ(mcftp::EncipheredLength(6), 10U);
  EXPECT_EQ(mcftp::EncipheredLength(10), 10U);
  EXPECT_EQ(mcftp::EncipheredLength(11), 18U);
  EXPECT_EQ(mcftp::EncipheredLength(1406), 1410U);
  EXPECT_EQ(mcftp::EncipheredLength(2), 2U);
}

}  // namespace
