#include "upgrade_config/selection/package_selection.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using orvenix::CompareCfgStr;
using orvenix::SelectsDevice;

struct Comparison {
  std::string pattern;
  std::string device;
  bool matches;
  const char* why;
};

TEST(CompareCfgStrTest, LetsTheShorterTextDecide) {
  const std::string long_text(63, 'a');
  const Comparison cases[] = {
      {"TQ52-A1", "TQ52-A1", true, "equal"},
      {"TQ52", "TQ52-A1", true, "a pattern that ends first matches"},
      {"TQ52-A1-X", "TQ52-A1", true, "deliberate: so does one that goes on"},
      {"TQ53", "TQ52-A1", false, "any other difference counts"},
      {"tq52", "TQ52-A1", false, "letter case counts"},
      {"T?5?", "TQ52-A1", true, "a question mark is any character"},
      {"????????", "TQ52-A1", true, "and may stand behind the device's end"},
      {"*", "TQ52-A1", true, "a star accepts everything"},
      {"T*x", "TQ52-A1", true, "nothing is compared behind it"},
      {"X*", "TQ52-A1", false, "but everything before it"},
      {"", "TQ52-A1", true, "an empty pattern ends at once"},
      {"TQ52", "", true, "and so does an empty text"},
      {"", "", true, "both"},
      {"TQ\rXX", "TQ52-A1", true, "a carriage return ends the pattern"},
      {"TQ\nXX", "TQ52-A1", true, "and so does a line feed"},
      {"TQ52-A1", "TQ\r52", true, "in the device's text too"},
      {"TQ52-A1", "TQ\nXX", true, "either of them"},
      {"T Q", "TQ", false, "a blank is a character"},
      {long_text + "x", long_text + "y", true, "only 63 characters are compared"},
      {long_text.substr(1) + "x", long_text.substr(1) + "y", false, "the 63rd still is"},
      {"\xE4*", "\xE4z", true, "any byte may stand for itself"},
  };
  for (const Comparison& c : cases) {
    EXPECT_EQ(CompareCfgStr(c.pattern, c.device), c.matches)
        << c.pattern << " on " << c.device << ": " << c.why;
  }
}

TEST(SelectsDeviceTest, TakesTheFirstPieceThatMatches) {
  const Comparison cases[] = {
      {"TQ52", "TQ52-A1", true, "one piece"},
      {"7?,X*", "7A", true, "the first of two"},
      {"7?,X*", "X9", true, "the second of two"},
      {"7?,X*", "Y7", false, "neither"},
      {"", "TQ52-A1", false, "no piece"},
      {",", "TQ52-A1", false, "an empty piece is none"},
      {",,,", "TQ52-A1", false, "nor are several"},
      {"XX,", "TQ52-A1", false, "nor is one at the end"},
      {",XX,,TQ,", "TQ52-A1", true, "empty pieces hide no other"},
      {"XX, TQ", "TQ52-A1", false, "a blank belongs to its piece"},
      {"XX,TQ", "", true, "a device that does not tell gets everything"},
      {",", "", false, "but not for no piece"},
  };
  for (const Comparison& c : cases) {
    EXPECT_EQ(SelectsDevice(c.pattern, c.device), c.matches)
        << c.pattern << " on " << c.device << ": " << c.why;
  }
}

}  // namespace
