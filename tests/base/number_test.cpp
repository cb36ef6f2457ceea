#include "base/number.h"

#include <gtest/gtest.h>

namespace {

struct NumberCase {
  const char* text;
  std::int32_t value;
  const char* why;
};

TEST(LeadingIntTest, ReadsWhatTheDevicesOwnReaderReads) {
  static constexpr NumberCase kCases[] = {
      {"8080", 8080, "plain digits"},
      {"80/index", 80, "stops at the first other character"},
      {"", 0, "nothing"},
      {"abc", 0, "no digits"},
      {" \t\r\n\v\f12", 12, "all white space is skipped"},
      {"-12", -12, "a minus sign"},
      {"+12", 12, "a plus sign"},
      {"--12", 0, "one sign only"},
      {"- 12", 0, "no white space behind the sign"},
      {"0x10", 0, "decimal only"},
      {"007", 7, "leading zeros"},
      {"2147483647", 2147483647, "the largest"},
      {"2147483648", -2147483647 - 1, "wraps like 32-bit arithmetic"},
      {"4294967296", 0, "wraps to 0"},
      {"99999999999999999999", 1661992959, "20 digits, modulo 2^32"},
  };
  for (const NumberCase& c : kCases) {
    EXPECT_EQ(base::LeadingInt(c.text), c.value) << '"' << c.text << "\": " << c.why;
  }
}

TEST(LeadingNumberTest, KeepsTheBitsOfLargeCrcs) {
  EXPECT_EQ(base::LeadingNumber("3421780262"), 0xCBF43926U);
  EXPECT_EQ(base::LeadingNumber("4294967295"), 0xFFFFFFFFU);
}

TEST(LeadingNumberTest, StopsAtTheEndOfAViewThatHasNoTerminator) {
  EXPECT_EQ(base::LeadingNumber(std::string_view("12345", 3)), 123U);
}

}  // namespace
