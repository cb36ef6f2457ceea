#include "mcftp/wire/texts.h"

#include <gtest/gtest.h>

namespace {

TEST(ErrorTextTest, IsThatOfTheCode) {
  const char* const kExpected[] = {"Undefined",
                                   "File not found",
                                   "Access violation",
                                   "Disk full or allocation exceeded",
                                   "Illegal operation",
                                   "Unknown transfer ID",
                                   "File already exists",
                                   "No such user",
                                   "Transfer should be terminated due to option negotiation"};
  for (std::uint16_t code = 0; code < 9; ++code) {
    EXPECT_STREQ(mcftp::ErrorText(code), kExpected[code]) << code;
  }
}

TEST(ErrorTextTest, IsUndefinedForEveryCodeOutsideTheTable) {
  for (const std::uint16_t code : {9, 64, 768, 0xFFFF}) {
    EXPECT_STREQ(mcftp::ErrorText(code), "Undefined") << code;
  }
}

TEST(ErrorTextTest, ComesFromSlotsOf64Bytes) {
  EXPECT_EQ(mcftp::ErrorText(8) - mcftp::ErrorText(0), 8 * 64);
}

TEST(VocabularyTest, HasItsWordsInOrderInSlotsOf16Bytes) {
  const char* const kExpected[] = {"netascii", "octet",     "mail",      "blksize",   "tsize",
                                   "timeout",  "multicast", "timestamp", "attributes"};
  const char* const first = mcftp::kVocabulary[0];
  for (int slot = 0; slot < 9; ++slot) EXPECT_STREQ(first + slot * 16, kExpected[slot]);
}

}  // namespace
