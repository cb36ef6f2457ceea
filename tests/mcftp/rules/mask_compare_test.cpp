#include "mcftp/rules/mask_compare.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using mcftp::MaskMatches;
using mcftp::NextMask;

struct MaskCase {
  std::string_view mask;
  std::string_view mct;
  bool matches;
  const char* why;
};

TEST(MaskMatchesTest, TreatsAMaskAsAPrefixPattern) {
  static constexpr MaskCase kCases[] = {
      {"MR41*", "MR41-A", true, "a star accepts the rest"},
      {"MR\?\?-A", "MR41-A", true, "each ? accepts one character"},  // \? for the trigraph warning
      {"MR41-A-X", "MR41-A", true, "deliberate: a mask longer than the MCT matches"},
      {"MR4", "MR41-A", true, "a mask that ends first matches"},
      {"MV41*", "MR41-A", false, "any other difference fails"},
      {"\rMV41", "MR41-A", true, "a leading carriage return accepts anything"},
      {"\nMV41", "MR41-A", true, "a line feed ends the mask, too"},
      {"MR\rXX", "MR41-A", true, "and so further behind"},
      {"MR41XX", "MR41\r\n", true, "a line end ends the MCT"},
      {"MR41XX", "MR41\nYY", true, "either of them"},
      {"mr41", "MR41-A", false, "letter case counts"},
      {"", "MR41-A", true, "nothing to differ"},
      {"MR41", "", true, "nothing to differ from"},
      {"*", "MR41-A", true, "everybody"},
      {"M*Z", "MR41-A", true, "what stands behind a star does not count"},
      {"?R41", "MR41", true, "also the first character"},
      {"MR4?X", "MR41", true, "the MCT ends before the X is looked at"},
      {"MX", "MR41", false, "the last character, too"},
  };
  for (const MaskCase& c : kCases) {
    EXPECT_EQ(MaskMatches(c.mask, c.mct), c.matches) << c.mask << " on " << c.mct << ": " << c.why;
  }
}

std::vector<std::string> Masks(std::string_view list) {
  std::vector<std::string> masks;
  for (;;) {
    const std::string_view mask = NextMask(list);
    if (mask.empty()) return masks;
    masks.emplace_back(mask);
  }
}

TEST(NextMaskTest, DividesTheListAtBlanksAndSemicolons) {
  using Strings = std::vector<std::string>;
  EXPECT_EQ(Masks(""), Strings());
  EXPECT_EQ(Masks(" ;; "), Strings());
  EXPECT_EQ(Masks("TQ5*"), Strings({"TQ5*"}));
  EXPECT_EQ(Masks("TQ5* MV??"), Strings({"TQ5*", "MV??"}));
  EXPECT_EQ(Masks(";TQ5*;;MV?? ; A,B\t"), Strings({"TQ5*", "MV??", "A,B\t"}));
}

}  // namespace
