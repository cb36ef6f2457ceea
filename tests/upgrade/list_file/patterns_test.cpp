#include "upgrade/list_file/patterns.h"

#include <gtest/gtest.h>

namespace upgrade {
namespace {

struct PatternCase {
  const char* pattern;
  const char* device;
  bool matches;
  const char* why;
};

TEST(ListPatternTest, TreatsPatternAndDeviceAsPrefixesOfEachOther) {
  static constexpr PatternCase kCases[] = {
      {"TQ52*", "TQ52-A1", true, "a star accepts the rest"},
      {"*", "TQ52-A1", true, "a star alone accepts everything"},
      {"TQ\?\?-A1", "TQ52-A1", true, "each question mark accepts one character"},
      {"TQ52-A1-X", "TQ52-A1", true, "a device string shorter than the pattern matches"},
      {"TQ", "TQ52-A1", true, "a pattern that ends first matches"},
      {"", "TQ52-A1", true, "an empty pattern ends at once"},
      {"TQ53", "TQ52-A1", false, "any other difference fails"},
      {"tq52", "TQ52-A1", false, "letter case counts"},
      {"\rXX", "TQ52-A1", true, "a leading carriage return accepts everything"},
      {"TQ\rXX", "TQ52-A1", true, "a carriage return ends the pattern"},
      {"TQ\nXX", "TQ52-A1", true, "so does a line feed"},
      {"TQ52-A1Z", "TQ52-A1\r\n", true, "the device's string ends at its line end"},
      {"X*", "TQ52-A1", false, "a difference before the star counts"},
      {"TQ52-A1", "", true, "an empty device string ends at once"},
  };
  for (const PatternCase& c : kCases) {
    EXPECT_EQ(ListPatternMatches(c.pattern, c.device), c.matches)
        << c.pattern << " on " << c.device << ": " << c.why;
  }
}

TEST(AnyListPatternTest, SplitsAtRunsOfBlanksAndSemicolons) {
  EXPECT_TRUE(AnyListPatternMatches("MR4*;TQ5*", "TQ52-A1"));
  EXPECT_TRUE(AnyListPatternMatches(" ;; MR4* ; TQ5* ", "TQ52-A1"));
  EXPECT_FALSE(AnyListPatternMatches("MR4*;MV5*", "TQ52-A1"));
}

TEST(AnyListPatternTest, MatchesNothingWithoutAPattern) {
  EXPECT_FALSE(AnyListPatternMatches("", "TQ52-A1"));
  EXPECT_FALSE(AnyListPatternMatches(" ; ;", "TQ52-A1"));
}

TEST(InfPatternTest, MustCoverTheWholeDeviceString) {
  static constexpr PatternCase kCases[] = {
      {"TQ52-A1", "TQ52-A1", true, "the string itself"},
      {"TQ5*-A1", "TQ52-A1", true, "a star stands for one character"},
      {"TQ52*", "TQ52-A1", false, "and not for the rest"},
      {"TQ52-A1-X", "TQ52-A1", true, "what the pattern holds beyond does not matter"},
      {"TQ", "TQ52-A1", false, "a pattern that ends first fails"},
      {"TQ\?2-A1", "TQ52-A1", false, "a question mark stands for itself"},
      {"TQ\?2-A1", "TQ\?2-A1", true, "and matches itself"},
      {"tq52-a1", "TQ52-A1", false, "letter case counts"},
      {"TQ52-A1", "TQ52-A1\r", true, "the device's string ends at its line end"},
      {"", "", true, "nothing is left to compare"},
      {"", "T", false, "an empty pattern covers nothing"},
  };
  for (const PatternCase& c : kCases) {
    EXPECT_EQ(InfPatternMatches(c.pattern, c.device), c.matches)
        << c.pattern << " on " << c.device << ": " << c.why;
  }
}

}  // namespace
}  // namespace upgrade
