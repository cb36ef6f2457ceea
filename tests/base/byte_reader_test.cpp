#include "base/byte_reader.h"

#include <gtest/gtest.h>

#include "support/hex.h"

namespace {

using base::ByteReader;
using test::Bytes;
using test::Hex;

TEST(ByteReaderTest, ReadsNumbersInNetworkOrder) {
  const Bytes bytes = Hex("01 0203 04050607");
  ByteReader in(bytes.data(), bytes.size());

  EXPECT_EQ(in.U8(), 0x01);
  EXPECT_EQ(in.U16(), 0x0203);
  EXPECT_EQ(in.U32(), 0x04050607U);
  EXPECT_EQ(in.left(), 0U);
  EXPECT_TRUE(in.ok());
}

TEST(ByteReaderTest, GivesZerosOnceItHasFailedAndNothingMore) {
  const Bytes bytes = Hex("ff ff ff");
  ByteReader in(bytes.data(), bytes.size());

  EXPECT_EQ(in.U32(), 0U);
  EXPECT_FALSE(in.ok());
  EXPECT_EQ(in.U8(), 0U) << "although there is a byte";
  EXPECT_EQ(in.Bytes(0), nullptr);
  EXPECT_EQ(in.Text(), "");
  EXPECT_EQ(in.left(), 0U);
}

TEST(ByteReaderTest, ReadsTextsUpToTheirZero) {
  const Bytes bytes = Hex("61 62 00 63 00 00 64");
  ByteReader in(bytes.data(), bytes.size());

  EXPECT_EQ(in.Text(), "ab");
  EXPECT_EQ(in.PaddedText(2), "c");
  EXPECT_EQ(in.Text(), "");
  EXPECT_TRUE(in.ok());
  EXPECT_EQ(in.Text(), "") << "no zero is left";
  EXPECT_FALSE(in.ok());
}

TEST(ByteReaderTest, ReadsAFieldThatItsTextFillsAndNoneThatIsNotWhole) {
  const Bytes bytes = Hex("61 62 63");
  ByteReader in(bytes.data(), bytes.size());

  EXPECT_EQ(in.PaddedText(2), "ab");
  EXPECT_EQ(in.PaddedText(2), "");
  EXPECT_FALSE(in.ok());
}

TEST(ByteReaderTest, ReadsTheRestAsATextThatNeedsNoZero) {
  for (const char* rest : {"61 62", "61 62 00", "61 62 00 63"}) {
    const Bytes bytes = Hex(rest);
    ByteReader in(bytes.data(), bytes.size());
    EXPECT_EQ(in.RestAsText(), "ab") << rest;
    EXPECT_EQ(in.left(), 0U);
    EXPECT_EQ(in.RestAsText(), "");
    EXPECT_TRUE(in.ok());
  }
}

TEST(ByteReaderTest, SkipsWhatIsThere) {
  const Bytes bytes = Hex("01 02 03");
  ByteReader in(bytes.data(), bytes.size());
  in.Skip(2);
  EXPECT_EQ(in.U8(), 3);
  in.Skip(1);
  EXPECT_FALSE(in.ok());
}

TEST(ByteReaderTest, ReadsNothingOutOfNothing) {
  ByteReader in(nullptr, 0);
  EXPECT_EQ(in.RestAsText(), "");
  EXPECT_EQ(in.PaddedText(0), "");
  EXPECT_TRUE(in.ok());
  EXPECT_EQ(in.U8(), 0);
  EXPECT_FALSE(in.ok());
}

}  // namespace
