#include "base/byte_writer.h"

#include <gtest/gtest.h>

#include "support/hex.h"

namespace {

using base::ByteWriter;
using test::Bytes;
using test::Hex;

TEST(ByteWriterTest, WritesNumbersInNetworkOrder) {
  Bytes out(7);
  ByteWriter to(out.data(), out.size());
  to.U8(0x01);
  to.U16(0x0203);
  to.U32(0x04050607);

  EXPECT_EQ(to.length(), 7U);
  EXPECT_EQ(out, Hex("01 0203 04050607"));
}

TEST(ByteWriterTest, WritesTextsWithTheirZeroAndFieldsWithPadding) {
  Bytes out(10, 0xCD);
  ByteWriter to(out.data(), out.size());
  to.Text("ab");
  to.PaddedText("c", 3);
  to.PaddedText("defg", 2);
  to.Zeros(2);

  EXPECT_EQ(to.length(), 10U);
  EXPECT_EQ(out, Hex("61 62 00 63 00 00 64 65 00 00"));
}

TEST(ByteWriterTest, WritesNothingFromTheFirstThatDoesNotFitOn) {
  Bytes out(6, 0xCD);
  ByteWriter to(out.data(), 5);
  to.U16(0x0102);
  to.U32(0x03040506);
  to.U8(0x07);
  to.Zeros(0);

  EXPECT_EQ(to.length(), 0U);
  EXPECT_EQ(out, Hex("01 02 cd cd cd cd"));
}

TEST(ByteWriterTest, TakesBytesThatLieInTheirPlaceAlready) {
  Bytes out = Hex("cd 01 02");
  ByteWriter to(out.data(), out.size());
  to.U8(0);
  to.Bytes(out.data() + 1, 2);

  EXPECT_EQ(to.length(), 3U);
  EXPECT_EQ(out, Hex("00 01 02"));
}

TEST(ByteWriterTest, WritesNothingIntoNothing) {
  ByteWriter to(nullptr, 0);
  to.Bytes(nullptr, 0);
  EXPECT_EQ(to.length(), 0U);
  to.U8(1);
  EXPECT_EQ(to.length(), 0U);
}

}  // namespace
