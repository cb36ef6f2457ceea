#include "mcftp/wire/status_datagram.h"

#include <gtest/gtest.h>

#include <string>

#include "mcftp/golden_frames.h"
#include "support/hex.h"

namespace {

using mcftp::StatusDatagram;
using test::Bytes;
using test::Hex;

bool Decode(const Bytes& bytes, StatusDatagram& status) {
  return mcftp::DecodeStatus(bytes.data(), bytes.size(), status);
}

TEST(StatusDatagramTest, IsWrittenToTheByte) {
  Bytes out(64);
  const StatusDatagram status{39, 512, 1300, "\\Temp\\a.bin"};
  out.resize(mcftp::EncodeStatus(status, out.data(), out.size()));
  EXPECT_EQ(out, Hex(golden::kStatus));
  EXPECT_EQ(out.size(), 13U + 11U);
}

TEST(StatusDatagramTest, IsReadToTheByte) {
  const Bytes bytes = Hex(golden::kStatus);
  StatusDatagram status;
  ASSERT_TRUE(Decode(bytes, status));
  EXPECT_EQ(status.percent, 39);
  EXPECT_EQ(status.total_bytes, 512U);
  EXPECT_EQ(status.file_size, 1300U);
  EXPECT_EQ(status.file_name, "\\Temp\\a.bin");
}

TEST(StatusDatagramTest, IsIgnoredWhenItsFieldsAreNotAllThere) {
  StatusDatagram status;
  for (std::size_t length = 0; length < 12; ++length) {
    EXPECT_FALSE(Decode(Bytes(length), status)) << length;
  }
  EXPECT_TRUE(Decode(Bytes(12), status));
  EXPECT_EQ(status.file_name, "");
}

TEST(StatusDatagramTest, HasANameThatEndsSomewhereWhateverComes) {
  Bytes bytes(12 + 300, 'x');
  StatusDatagram status;
  ASSERT_TRUE(Decode(bytes, status));
  EXPECT_EQ(status.file_name, std::string(259, 'x')) << "cut";
  bytes[12 + 4] = 0;
  ASSERT_TRUE(Decode(bytes, status));
  EXPECT_EQ(status.file_name, "xxxx") << "up to the zero";
  bytes.resize(12 + 3);
  ASSERT_TRUE(Decode(bytes, status));
  EXPECT_EQ(status.file_name, "xxx") << "up to the end";
}

TEST(StatusDatagramTest, IsNotWrittenWhereItDoesNotFit) {
  Bytes out(24, 0xCD);
  const StatusDatagram status{39, 512, 1300, "\\Temp\\a.bin"};
  EXPECT_EQ(mcftp::EncodeStatus(status, out.data(), 23), 0U);
  EXPECT_EQ(mcftp::EncodeStatus(status, out.data(), 24), 24U);
}

}  // namespace
