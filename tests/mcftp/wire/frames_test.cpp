#include "mcftp/wire/frames.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "mcftp/golden_frames.h"
#include "mcftp/wire/texts.h"
#include "support/hex.h"

namespace {

using mcftp::Announcement;
using mcftp::Header;
using mcftp::Opcode;
using mcftp::Role;
using test::Bytes;
using test::Hex;
using test::ToHex;

/// What an encoder makes of a record; every byte behind it must stay as it was.
template <typename Frame>
Bytes Encode(std::size_t (*encode)(const Frame&, std::uint8_t*, std::size_t) noexcept,
             const Frame& frame, std::size_t capacity = 2048) {
  constexpr std::uint8_t kUntouched = 0xCD;
  Bytes out(capacity + 16, kUntouched);
  const std::size_t length = encode(frame, out.data(), capacity);
  EXPECT_LE(length, capacity);
  for (std::size_t i = capacity; i < out.size(); ++i) EXPECT_EQ(out[i], kUntouched);
  out.resize(length);
  return out;
}

/// Decodes from a block of exactly the frame's size, so that the sanitizer sees a read behind it.
template <typename Frame>
bool Decode(bool (*decode)(const std::uint8_t*, std::size_t, Frame&) noexcept, const Bytes& bytes) {
  const std::vector<std::uint8_t> exact(bytes.begin(), bytes.end());
  Frame frame;
  return decode(exact.data(), exact.size(), frame);
}

Header HeaderOf(const Bytes& frame) {
  Header header;
  EXPECT_TRUE(mcftp::DecodeHeader(frame.data(), frame.size(), header)) << ToHex(frame);
  return header;
}

Announcement GoldenAnnouncement() {
  Announcement announcement;
  announcement.last_file = true;
  announcement.block_size = 512;
  announcement.file_size = 1300;
  announcement.oack_wait_ms = 1000;
  announcement.attributes = 32;
  announcement.transfer_id = 0x11;
  std::strcpy(announcement.time_stamp, "2006-03-01 14:05:09");
  announcement.server_port = 7001;
  announcement.server_address = 0x0A000002;
  announcement.step_percent = 5;
  announcement.file_name = "\\Temp\\a.bin";
  return announcement;
}

TEST(FrameHeaderTest, TakesTheFirstWordApart) {
  struct Case {
    const char* bytes;
    Opcode opcode;
    bool last_file, resend, duplicate, encrypted;
    std::uint8_t role_bits;
  };
  constexpr Case kCases[] = {
      {"00 11", Opcode::kReadRequest, true, false, false, false, 0},
      {"00 20", Opcode::kAnnouncement, false, false, false, false, 0},
      {"80 30", Opcode::kData, false, false, false, true, 0},
      {"01 40", Opcode::kAck, false, false, true, false, 0},
      {"00 52", Opcode::kNak, false, true, false, false, 0},
      {"81 60", Opcode::kError, false, false, true, true, 0},
      {"00 78", Opcode::kOptionAck, false, false, false, false, 2},
  };
  for (const Case& c : kCases) {
    const Header header = HeaderOf(Hex(c.bytes));
    EXPECT_TRUE(header.Is(c.opcode)) << c.bytes;
    EXPECT_EQ(header.last_file, c.last_file) << c.bytes;
    EXPECT_EQ(header.resend, c.resend) << c.bytes;
    EXPECT_EQ(header.duplicate, c.duplicate) << c.bytes;
    EXPECT_EQ(header.encrypted, c.encrypted) << c.bytes;
    EXPECT_EQ(header.role_bits, c.role_bits) << c.bytes;
  }
}

TEST(FrameHeaderTest, IsDroppedWithAnyReservedBitAndWhenItIsTooShort) {
  for (const char* bytes : {"10 40", "20 40", "40 40", "70 40", "90 40", "", "00"}) {
    const Bytes frame = Hex(bytes);
    Header header;
    EXPECT_FALSE(mcftp::DecodeHeader(frame.data(), frame.size(), header)) << bytes;
  }
}

TEST(FrameHeaderTest, IgnoresItsUnusedBits) {
  EXPECT_TRUE(HeaderOf(Hex("0e 40")).Is(Opcode::kAck));
  EXPECT_FALSE(HeaderOf(Hex("0e 40")).duplicate);
}

TEST(FrameHeaderTest, TravelsThereAndBackForEveryWordWithoutUnusedBits) {
  for (unsigned word = 0; word <= 0xFFFF; ++word) {
    const auto wire = static_cast<std::uint16_t>(word);
    EXPECT_EQ(mcftp::PackHeader(mcftp::UnpackHeader(wire)), wire & 0x81FF);
  }
}

TEST(FrameHeaderTest, NamesNoRoleWithBothBits) {
  EXPECT_EQ(mcftp::RoleOf(HeaderOf(Hex("00 70"))), Role::kPassive);
  EXPECT_EQ(mcftp::RoleOf(HeaderOf(Hex("00 74"))), Role::kAckMaster);
  EXPECT_EQ(mcftp::RoleOf(HeaderOf(Hex("00 78"))), Role::kNakMaster);
  EXPECT_EQ(mcftp::RoleOf(HeaderOf(Hex("00 7c"))), std::nullopt);
}

TEST(FrameHeaderTest, FlagsAreSetInWireForm) {
  Bytes frame = Hex("71 41");

  mcftp::SetEncryptedFlag(frame.data(), true);
  EXPECT_EQ(frame, Hex("81 41")) << "reserved bits are always sent as 0";
  mcftp::SetEncryptedFlag(frame.data(), false);
  EXPECT_EQ(frame, Hex("01 41"));
  mcftp::SetResendFlag(frame.data());
  EXPECT_EQ(frame, Hex("01 43"));
}

TEST(MinimumLengthTest, IsTheFixedPartOfEachFrame) {
  const std::size_t kExpected[16] = {2, 52, 53, 6, 6, 6, 6, 10, 2, 2, 2, 2, 2, 2, 2, 2};
  for (std::uint8_t opcode = 0; opcode < 16; ++opcode) {
    EXPECT_EQ(mcftp::MinimumLength(opcode), kExpected[opcode]) << int{opcode};
  }
}

TEST(AnnouncementTest, IsWrittenToTheByte) {
  EXPECT_EQ(ToHex(Encode(mcftp::EncodeAnnouncement, GoldenAnnouncement())),
            ToHex(Hex(golden::kAnnouncement)));
}

TEST(AnnouncementTest, IsReadToTheByte) {
  const Bytes frame = Hex(golden::kMaskedAnnouncement);
  Announcement announcement;
  ASSERT_TRUE(mcftp::DecodeAnnouncement(frame.data(), frame.size(), announcement));

  EXPECT_FALSE(announcement.last_file);
  EXPECT_EQ(announcement.reserved_word, 0);
  EXPECT_EQ(announcement.block_size, 512);
  EXPECT_EQ(announcement.file_size, 2500U);
  EXPECT_EQ(announcement.oack_wait_ms, 1000U);
  EXPECT_EQ(announcement.attributes, 32U);
  EXPECT_EQ(announcement.transfer_id, 0x12U);
  EXPECT_STREQ(announcement.time_stamp, "2006-03-01 14:05:09");
  EXPECT_EQ(announcement.server_port, 7001);
  EXPECT_EQ(announcement.server_address, 0x0A000002U);
  EXPECT_EQ(announcement.step_percent, 5);
  EXPECT_EQ(announcement.step_kib, 0);
  EXPECT_EQ(announcement.file_name, "\\Temp\\b.bin");
  EXPECT_EQ(announcement.masks, "TQ5*");
  EXPECT_EQ(announcement.BlockCount(), 5U);
}

TEST(AnnouncementTest, KeepsEveryFieldAtItsLimits) {
  Announcement announcement = GoldenAnnouncement();
  announcement.reserved_word = 0xFFFF;
  announcement.block_size = 0xFFFF;
  announcement.file_size = 65536U * 65535U;
  announcement.oack_wait_ms = announcement.attributes = announcement.transfer_id = 0xFFFFFFFF;
  announcement.server_port = announcement.step_kib = 0xFFFF;
  announcement.server_address = 0xFFFFFFFF;
  announcement.step_percent = 0xFF;
  ASSERT_EQ(announcement.BlockCount(), 65536U);
  EXPECT_TRUE(Encode(mcftp::EncodeAnnouncement, announcement).empty()) << "one block too many";
  announcement.file_size = 65535U * 65535U;
  std::memcpy(announcement.time_stamp, "12345-12-31 23:59:59", 21);  // fills its field
  const std::string name(259, 'n');
  const std::string masks(1500, 'm');
  announcement.file_name = name;
  announcement.masks = masks;

  const Bytes frame = Encode(mcftp::EncodeAnnouncement, announcement);
  Announcement again;
  ASSERT_TRUE(mcftp::DecodeAnnouncement(frame.data(), frame.size(), again));

  EXPECT_EQ(frame.size(), 51U + 260U + 1501U);
  EXPECT_EQ(again.reserved_word, 0xFFFF);
  EXPECT_EQ(again.block_size, 0xFFFF);
  EXPECT_EQ(again.file_size, 65535U * 65535U);
  EXPECT_EQ(again.BlockCount(), 65535U);
  EXPECT_EQ(again.oack_wait_ms, 0xFFFFFFFFU);
  EXPECT_EQ(again.attributes, 0xFFFFFFFFU);
  EXPECT_EQ(again.transfer_id, 0xFFFFFFFFU);
  EXPECT_STREQ(again.time_stamp, "12345-12-31 23:59:59");
  EXPECT_EQ(again.server_port, 0xFFFF);
  EXPECT_EQ(again.server_address, 0xFFFFFFFFU);
  EXPECT_EQ(again.step_percent, 0xFF);
  EXPECT_EQ(again.step_kib, 0xFFFF);
  EXPECT_EQ(again.file_name, name);
  EXPECT_EQ(again.masks, masks);
}

TEST(AnnouncementTest, CountsTheBlocksOfAFileRoundedUp) {
  Announcement announcement;
  announcement.block_size = 512;
  const struct {
    std::uint32_t size, blocks;
  } kCases[] = {{10000, 20}, {10240, 20}, {10241, 21}, {0, 0}, {1, 1}, {0xFFFFFFFF, 8388608}};
  for (const auto& c : kCases) {
    announcement.file_size = c.size;
    EXPECT_EQ(announcement.BlockCount(), c.blocks) << c.size;
  }
}

TEST(AnnouncementTest, OfAnEmptyFileHasNoBlocksAndNoTimeStamp) {
  const Bytes frame = Hex(golden::kEmptyLastFile);
  Announcement announcement;
  ASSERT_TRUE(mcftp::DecodeAnnouncement(frame.data(), frame.size(), announcement));

  EXPECT_TRUE(announcement.last_file);
  EXPECT_EQ(announcement.BlockCount(), 0U);
  EXPECT_STREQ(announcement.time_stamp, "");
  EXPECT_EQ(announcement.masks, "");
}

TEST(AnnouncementTest, IsDroppedAtEveryLengthThatCutsAText) {
  const Bytes whole = Hex(golden::kMaskedAnnouncement);
  for (std::size_t length = 0; length < whole.size(); ++length) {
    const Bytes cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length));
    EXPECT_FALSE(Decode(mcftp::DecodeAnnouncement, cut)) << length;
  }
  EXPECT_TRUE(Decode(mcftp::DecodeAnnouncement, whole));
}

TEST(AnnouncementTest, IgnoresThePaddingOfTheCipher) {
  Bytes frame = Hex(golden::kMaskedAnnouncement);
  frame.insert(frame.end(), 7, 0);
  EXPECT_TRUE(Decode(mcftp::DecodeAnnouncement, frame));
}

TEST(AnnouncementTest, IsDroppedWithoutABlockSize) {
  Bytes frame = Hex(golden::kAnnouncement);
  frame[4] = 0;
  EXPECT_FALSE(Decode(mcftp::DecodeAnnouncement, frame));
}

TEST(AnnouncementTest, IsDroppedWhenTheBlocksHaveNoNumbers) {
  Bytes frame = Hex(golden::kAnnouncement);
  frame[4] = 0;
  frame[5] = 1;  // blocks of one byte
  frame[7] = 0;
  frame[8] = frame[9] = 0xFF;
  EXPECT_TRUE(Decode(mcftp::DecodeAnnouncement, frame)) << "65,535 blocks";
  frame[7] = 1;
  frame[8] = frame[9] = 0;
  EXPECT_FALSE(Decode(mcftp::DecodeAnnouncement, frame)) << "65,536 blocks";
}

TEST(AnnouncementTest, IsDroppedWithANameOfNoneOrTooManyCharacters) {
  const Bytes whole = Hex(golden::kAnnouncement);
  const auto with_name = [&](std::size_t characters) {
    Bytes frame(whole.begin(), whole.begin() + 51);
    frame.insert(frame.end(), characters, 'x');
    frame.insert(frame.end(), 2, 0);
    return frame;
  };
  EXPECT_FALSE(Decode(mcftp::DecodeAnnouncement, with_name(0)));
  EXPECT_TRUE(Decode(mcftp::DecodeAnnouncement, with_name(1)));
  EXPECT_TRUE(Decode(mcftp::DecodeAnnouncement, with_name(259)));
  EXPECT_FALSE(Decode(mcftp::DecodeAnnouncement, with_name(260)));
}

TEST(AnnouncementTest, IsNotWrittenWhenNoClientCouldTakeIt) {
  const auto encoded = [](auto change) {
    Announcement announcement = GoldenAnnouncement();
    change(announcement);
    return Encode(mcftp::EncodeAnnouncement, announcement).size();
  };
  const std::string long_name(260, 'x');
  EXPECT_EQ(encoded([](Announcement& a) { a.block_size = 0; }), 0U);
  EXPECT_EQ(encoded([](Announcement& a) { a.file_size = 65535 * 512 + 1; }), 0U);
  EXPECT_EQ(encoded([](Announcement& a) { a.file_name = ""; }), 0U);
  EXPECT_EQ(encoded([&](Announcement& a) { a.file_name = long_name; }), 0U);
  EXPECT_EQ(encoded([](Announcement& a) { a.file_name = {"a\0b", 3}; }), 0U);
  EXPECT_EQ(encoded([](Announcement& a) { a.masks = {"a\0b", 3}; }), 0U);
  EXPECT_NE(encoded([](Announcement& a) { a.file_size = 65535 * 512; }), 0U);
}

TEST(ReadRequestTest, IsWrittenToTheByte) {
  mcftp::ReadRequest request;
  request.last_file = true;
  request.transfer_id = 0x11;
  request.file_name = "\\Temp\\a.bin";

  EXPECT_EQ(ToHex(Encode(mcftp::EncodeReadRequest, request)), ToHex(Hex(golden::kReadRequest)));
  EXPECT_EQ(Hex(golden::kReadRequest).size(), 52U + 11U);
}

TEST(ReadRequestTest, IsReadToTheByte) {
  const Bytes frame = Hex(golden::kReadRequest);
  mcftp::ReadRequest request;
  ASSERT_TRUE(mcftp::DecodeReadRequest(frame.data(), frame.size(), request));

  EXPECT_TRUE(request.last_file);
  EXPECT_EQ(request.transfer_id, 0x11U);
  EXPECT_EQ(request.file_name, "\\Temp\\a.bin");
}

TEST(ReadRequestTest, IsDroppedAtEveryLengthThatCutsTheName) {
  const Bytes whole = Hex(golden::kReadRequest);
  for (std::size_t length = 0; length < whole.size(); ++length) {
    const Bytes cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length));
    EXPECT_FALSE(Decode(mcftp::DecodeReadRequest, cut)) << length;
  }
  Bytes nameless(whole.begin(), whole.begin() + 51);
  nameless.push_back(0);
  EXPECT_FALSE(Decode(mcftp::DecodeReadRequest, nameless));
}

TEST(ReadRequestTest, IsNotWrittenWithANameThatNoServerTakes) {
  const std::string long_name(260, 'x');
  for (const std::string_view name :
       {std::string_view(), std::string_view(long_name), std::string_view("a\0b", 3)}) {
    mcftp::ReadRequest request;
    request.file_name = name;
    EXPECT_EQ(Encode(mcftp::EncodeReadRequest, request).size(), 0U) << name;
  }
}

TEST(ReadRequestTest, WithTheLongestNameIsTheLongest) {
  const std::string name(mcftp::kMaxFileName, 'x');
  mcftp::ReadRequest request;
  request.file_name = name;
  EXPECT_EQ(Encode(mcftp::EncodeReadRequest, request, mcftp::kMaxReadRequest).size(),
            mcftp::kMaxReadRequest);
}

TEST(DataFrameTest, IsWrittenAndReadToTheByte) {
  const Bytes hello = Hex("68 65 6c 6c 6f");
  const Bytes frame = Encode(mcftp::EncodeData, mcftp::DataFrame{5, 3, hello.data()});
  EXPECT_EQ(frame, Hex(golden::kData));

  mcftp::DataFrame data;
  ASSERT_TRUE(mcftp::DecodeData(frame.data(), frame.size(), data));
  EXPECT_EQ(data.block, 3);
  EXPECT_EQ(data.length, 5);
  EXPECT_EQ(data.data, frame.data() + 6);
}

TEST(DataFrameTest, IsWrittenAroundDataThatLiesInItsPlace) {
  Bytes frame = Hex("cd cd cd cd cd cd 68 65 6c 6c 6f");
  const mcftp::DataFrame data{5, 3, frame.data() + mcftp::kDataOffset};
  EXPECT_EQ(mcftp::EncodeData(data, frame.data(), frame.size()), frame.size());
  EXPECT_EQ(frame, Hex(golden::kData));
}

TEST(DataFrameTest, MayCarryNoData) {
  EXPECT_EQ(Encode(mcftp::EncodeData, mcftp::DataFrame{0, 1, nullptr}), Hex("00 30 00 00 00 01"));
  EXPECT_TRUE(Decode(mcftp::DecodeData, Hex("00 30 00 00 00 01")));
}

TEST(DataFrameTest, IsDroppedWhenItClaimsMoreThanItHas) {
  const Bytes whole = Hex(golden::kData);
  for (std::size_t length = 0; length < whole.size(); ++length) {
    const Bytes cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length));
    EXPECT_FALSE(Decode(mcftp::DecodeData, cut)) << length;
  }
  EXPECT_FALSE(Decode(mcftp::DecodeData, Hex("00 30 ff ff 00 01 00")));
}

TEST(DataFrameTest, BelongsToAFileByNumberAndSize) {
  struct Case {
    std::uint16_t block, length, block_size;
    std::uint32_t block_count;
    bool fits;
  };
  constexpr Case kCases[] = {
      {1, 512, 512, 3, true},     {3, 276, 512, 3, true},     {3, 0, 512, 3, true},
      {0, 512, 512, 3, false},    {4, 512, 512, 3, false},    {1, 513, 512, 3, false},
      {1, 0, 512, 0, false},      {65535, 1, 1, 65535, true}, {65535, 1, 1, 65534, false},
      {1, 65535, 65535, 1, true},
  };
  for (const Case& c : kCases) {
    const mcftp::DataFrame data{c.length, c.block, nullptr};
    EXPECT_EQ(mcftp::FitsSession(data, c.block_size, c.block_count), c.fits)
        << "block " << c.block << " of " << c.length << " bytes";
  }
}

TEST(AckTest, IsWrittenAndReadToTheByte) {
  EXPECT_EQ(Encode(mcftp::EncodeAck, mcftp::AckFrame{0, false}), Hex(golden::kAck0));
  EXPECT_EQ(Encode(mcftp::EncodeAck, mcftp::AckFrame{5, false}), Hex(golden::kAck5));
  EXPECT_EQ(Encode(mcftp::EncodeAck, mcftp::AckFrame{5, true}), Hex(golden::kDuplicateAck5));

  const Bytes frame = Hex("01 40 00 00 fe dc");
  mcftp::AckFrame ack;
  ASSERT_TRUE(mcftp::DecodeAck(frame.data(), frame.size(), ack));
  EXPECT_EQ(ack.block, 0xFEDC);
  EXPECT_TRUE(ack.duplicate);
}

TEST(NakTest, IsWrittenAndReadToTheByte) {
  EXPECT_EQ(Encode(mcftp::EncodeNak, mcftp::NakFrame{2}), Hex(golden::kNak2));

  const Bytes frame = Hex("00 50 00 00 fe dc");
  mcftp::NakFrame nak;
  ASSERT_TRUE(mcftp::DecodeNak(frame.data(), frame.size(), nak));
  EXPECT_EQ(nak.block, 0xFEDC);
}

TEST(ErrorFrameTest, IsWrittenToTheByte) {
  const auto table = [](std::uint16_t code) {
    return Encode(mcftp::EncodeError, mcftp::ErrorFrame{code, mcftp::ErrorText(code)});
  };
  EXPECT_EQ(table(5), Hex(golden::kUnknownTransfer));
  EXPECT_EQ(table(3), Hex(golden::kDiskFull));
  EXPECT_EQ(Encode(mcftp::EncodeError, mcftp::ErrorFrame{mcftp::kOverrunCode, "Overrun:6750:120"}),
            Hex(golden::kOverrun));
  EXPECT_EQ(Encode(mcftp::EncodeError, mcftp::ErrorFrame{1, {"a\0b", 3}}),
            Hex("00 60 00 00 00 01 61 00"));
}

TEST(ErrorFrameTest, EndsItsMessageAtAZeroOrWithTheFrame) {
  const auto message = [](const char* bytes) {
    const Bytes frame = Hex(bytes);
    mcftp::ErrorFrame error;
    EXPECT_TRUE(mcftp::DecodeError(frame.data(), frame.size(), error)) << bytes;
    EXPECT_EQ(error.code, 64);
    return std::string(error.message);
  };
  EXPECT_EQ(message(golden::kOverrun), "Overrun:6750:120");
  EXPECT_EQ(message("00 60 00 00 00 40 61 62"), "ab");
  EXPECT_EQ(message("00 60 00 00 00 40 61 00 62"), "a");
  EXPECT_EQ(message("00 60 00 00 00 40"), "");
}

TEST(OptionAckTest, IsWrittenAndReadToTheByte) {
  const struct {
    const char* bytes;
    Role role;
  } kCases[] = {{golden::kOackPassive, Role::kPassive},
                {golden::kOackAckMaster, Role::kAckMaster},
                {golden::kOackNakMaster, Role::kNakMaster}};
  for (const auto& c : kCases) {
    const Bytes frame = Encode(mcftp::EncodeOptionAck, mcftp::OptionAck{c.role, 7000, 0xEF010102});
    EXPECT_EQ(ToHex(frame), c.bytes);
    mcftp::OptionAck oack;
    ASSERT_TRUE(mcftp::DecodeOptionAck(frame.data(), frame.size(), oack));
    EXPECT_EQ(oack.role, c.role);
    EXPECT_EQ(oack.port, 7000);
    EXPECT_EQ(oack.address, 0xEF010102U);
  }
}

TEST(OptionAckTest, MayNameNoRole) {
  const Bytes frame = Hex("00 7c 00 00 1b 58 ef 01 01 02");
  mcftp::OptionAck oack;
  ASSERT_TRUE(mcftp::DecodeOptionAck(frame.data(), frame.size(), oack));
  EXPECT_EQ(oack.role, std::nullopt);
  EXPECT_EQ(Encode(mcftp::EncodeOptionAck, oack), frame);
}

TEST(ShortFramesTest, AreDroppedAtEveryLengthBelowTheirFixedPart) {
  for (std::size_t length = 0; length < 10; ++length) {
    const Bytes zeros(length, 0);
    EXPECT_EQ(Decode(mcftp::DecodeAck, zeros), length >= 6) << length;
    EXPECT_EQ(Decode(mcftp::DecodeNak, zeros), length >= 6) << length;
    EXPECT_EQ(Decode(mcftp::DecodeError, zeros), length >= 6) << length;
    EXPECT_EQ(Decode(mcftp::DecodeData, zeros), length >= 6) << length;
    EXPECT_FALSE(Decode(mcftp::DecodeOptionAck, zeros)) << length;
  }
  EXPECT_TRUE(Decode(mcftp::DecodeOptionAck, Bytes(10, 0)));
}

TEST(EncodersTest, WriteNothingThatDoesNotFit) {
  const std::uint8_t data[5] = {};
  for (std::size_t capacity = 0; capacity < 64; ++capacity) {
    mcftp::ReadRequest request;
    request.file_name = "\\Temp\\a.bin";
    const auto expected = [&](std::size_t length) { return capacity >= length ? length : 0; };
    EXPECT_EQ(Encode(mcftp::EncodeAnnouncement, GoldenAnnouncement(), capacity).size(),
              expected(64));
    EXPECT_EQ(Encode(mcftp::EncodeReadRequest, request, capacity).size(), expected(63));
    EXPECT_EQ(Encode(mcftp::EncodeData, mcftp::DataFrame{5, 1, data}, capacity).size(),
              expected(11));
    EXPECT_EQ(Encode(mcftp::EncodeAck, mcftp::AckFrame{}, capacity).size(), expected(6));
    EXPECT_EQ(Encode(mcftp::EncodeNak, mcftp::NakFrame{}, capacity).size(), expected(6));
    EXPECT_EQ(Encode(mcftp::EncodeError, mcftp::ErrorFrame{1, "abc"}, capacity).size(),
              expected(10));
    EXPECT_EQ(Encode(mcftp::EncodeOptionAck, mcftp::OptionAck{}, capacity).size(), expected(10));
  }
}

TEST(EncodersTest, WriteNoFrameThatFitsNoDatagram) {
  const Bytes block(65535);
  EXPECT_EQ(Encode(mcftp::EncodeData, mcftp::DataFrame{65501, 1, block.data()}, 70000).size(),
            65507U);
  EXPECT_EQ(Encode(mcftp::EncodeData, mcftp::DataFrame{65502, 1, block.data()}, 70000).size(), 0U);
}

}  // namespace
