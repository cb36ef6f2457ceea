#include "mcftp/rules/time_stamp.h"

#include <gtest/gtest.h>

#include <array>

namespace {

std::array<int, 6> Parse(std::string_view text) {
  const mcftp::TimeStamp stamp = mcftp::ParseTimeStamp(text);
  return {stamp.year, stamp.month, stamp.day, stamp.hour, stamp.minute, stamp.second};
}
using Fields = std::array<int, 6>;

TEST(ParseTimeStampTest, ReadsSixNumbers) {
  EXPECT_EQ(Parse("2006-03-01 14:05:09"), (Fields{2006, 3, 1, 14, 5, 9}));
  EXPECT_EQ(Parse("2006-3-1 4:5:9"), (Fields{2006, 3, 1, 4, 5, 9}));
  EXPECT_EQ(Parse("2006-03-01 14:05:09x"), (Fields{2006, 3, 1, 14, 5, 9}));
}

TEST(ParseTimeStampTest, EndsAtTheFirstThingThatIsNotSo) {
  EXPECT_EQ(Parse(""), (Fields{}));
  EXPECT_EQ(Parse("x"), (Fields{}));
  EXPECT_EQ(Parse("2006"), (Fields{2006}));
  EXPECT_EQ(Parse("2006/03/01"), (Fields{2006}));
  EXPECT_EQ(Parse("2006-03-01"), (Fields{2006, 3, 1}));
  EXPECT_EQ(Parse("2006-03-01T14:05:09"), (Fields{2006, 3, 1}));
  EXPECT_EQ(Parse("2006--3-01"), (Fields{2006}));
  EXPECT_EQ(Parse("-2006"), (Fields{}));
  EXPECT_EQ(Parse("2006-99999-01 14:05:09"), (Fields{2006}));
  EXPECT_EQ(Parse("99999999999999999999"), (Fields{}));
}

}  // namespace
