#include "base/format.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <string>
#include <utility>

namespace {

// Formats that a compiler would complain about are what several tests are for.
#pragma GCC diagnostic ignored "-Wformat"
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
#pragma GCC diagnostic ignored "-Wformat-security"
#pragma GCC diagnostic ignored "-Wformat-extra-args"

template <std::size_t Capacity = 64, typename... Arguments>
std::string Formatted(const char* format, Arguments... arguments) {
  char out[Capacity + 4];
  std::fill(std::begin(out), std::end(out), '#');
  const std::size_t length = base::Format(out, Capacity, format, arguments...);
  EXPECT_EQ(out[length], '\0');
  for (std::size_t i = Capacity; i < sizeof out; ++i) EXPECT_EQ(out[i], '#') << "byte " << i;
  return {out, length};
}

TEST(FormatTest, CopiesTextAsItStands) {
  EXPECT_EQ(Formatted("Entering\r\n"), "Entering\r\n");
  EXPECT_EQ(Formatted(""), "");
}

TEST(FormatTest, WritesSignedNumbers) {
  EXPECT_EQ(Formatted("%d %i %d", 0, 42, -7), "0 42 -7");
  EXPECT_EQ(Formatted("%d", INT_MIN), "-2147483648");
  EXPECT_EQ(Formatted("%d", 3421780262U), "-873187034") << "a CRC above 2^31, as the log shows it";
}

TEST(FormatTest, WritesUnsignedAndHexadecimalNumbers) {
  EXPECT_EQ(Formatted("%u %x %X", 4294967295U, 0xBEEFU, 0xC4111002U), "4294967295 beef C4111002");
  EXPECT_EQ(Formatted("%lu", 14U), "14") << "long has 32 bits on the device";
}

TEST(FormatTest, PadsToTheWidth) {
  EXPECT_EQ(Formatted("<%3d>", 14), "< 14>");
  EXPECT_EQ(Formatted("%04d-%02d", 2006, 3), "2006-03");
  EXPECT_EQ(Formatted("%-5d|", 42), "42   |");
  EXPECT_EQ(Formatted("%05d", -42), "-0042") << "zeros stand behind the sign";
  EXPECT_EQ(Formatted("%-05d|", -42), "-42  |") << "zeros never stand on the right";
  EXPECT_EQ(Formatted("%2d", 12345), "12345") << "a width never cuts";
  EXPECT_EQ(Formatted("%*d|%*d|", 4, 7, -4, 7), "   7|7   |");
  EXPECT_EQ(Formatted("%5s|%-5s|%05s", "ab", "ab", "ab"), "   ab|ab   |   ab");
  EXPECT_EQ(Formatted("%3c|", 'x'), "  x|");
}

TEST(FormatTest, CutsATextAtItsPrecision) {
  EXPECT_EQ(Formatted("%.3s|%.0s|%.9s", "abcdef", "abcdef", "abc"), "abc||abc");
  EXPECT_EQ(Formatted("%.*s|%.*s", 2, "abcdef", -1, "abcdef"), "ab|abcdef");
  const char unterminated[3] = {'a', 'b', 'c'};
  EXPECT_EQ(Formatted("%.3s", unterminated), "abc") << "nothing behind the precision is read";
}

TEST(FormatTest, PrintsNothingForANullText) {
  EXPECT_EQ(Formatted("[%s]", static_cast<const char*>(nullptr)), "[]");
  EXPECT_EQ(Formatted("[%3s]", static_cast<const char*>(nullptr)), "[   ]");
}

TEST(FormatTest, WritesOnePercentForTwo) {
  EXPECT_EQ(Formatted("!%d%%\r\n", 5), "!5%\r\n");
}

TEST(FormatTest, CopiesWhatItDoesNotKnowAndGoesOn) {
  EXPECT_EQ(Formatted("%y %d", 5), "%y 5");
  EXPECT_EQ(Formatted("%-08.3y|"), "%-08.3y|");
  EXPECT_EQ(Formatted("100%"), "100%");
  EXPECT_EQ(Formatted("%5"), "%5");
  EXPECT_EQ(Formatted("%l"), "%l");
  EXPECT_EQ(Formatted("%."), "%.");
  EXPECT_EQ(Formatted("%\r\n"), "%\r\n");
}

TEST(FormatTest, StopsAtTheEndOfTheBuffer) {
  EXPECT_EQ(Formatted<4>("%s", "abcdef"), "abc");
  EXPECT_EQ(Formatted<4>("%d", 123456), "123");
  EXPECT_EQ(Formatted<4>("%10d", 1), "   ");
  EXPECT_EQ(Formatted<1>("abc"), "");
}

TEST(FormatTest, WritesNothingIntoNoRoom) {
  char untouched = '#';
  EXPECT_EQ(base::Format(&untouched, 0, "abc"), 0U);
  EXPECT_EQ(untouched, '#');
}

TEST(FormatTest, EndsQuicklyWhateverTheWidth) {
  EXPECT_EQ(Formatted<8>("%2147483647d", 1), "       ");
  EXPECT_EQ(Formatted<8>("%99999999999999999999d", 1), "       ");
  EXPECT_EQ(Formatted<8>("%*d", INT_MAX, 1), "       ");
  EXPECT_EQ(Formatted<8>("%*d", INT_MIN, 1), "1      ") << "the width of -2^31 is 2^31";
  EXPECT_EQ(Formatted<8>("%0*d", INT_MAX, 1), "0000000");
  EXPECT_EQ(Formatted<8>("%.*s", INT_MAX, "ab"), "ab");
  EXPECT_EQ(Formatted<8>("%.99999999999999999999s", "ab"), "ab");
}

TEST(FormatTest, TextOutOfAnArgumentIsNeverAFormat) {
  EXPECT_EQ(Formatted("%s", "%s%n%d"), "%s%n%d");
}

std::string ThroughV(const char* format, ...) {
  char first[32];
  char second[32];
  va_list arguments;
  va_start(arguments, format);
  base::FormatV(first, sizeof first, format, arguments);
  base::FormatV(second, sizeof second, format, arguments);
  va_end(arguments);
  return std::string(first) + " " + second;
}

TEST(FormatTest, LeavesTheCallersArgumentsWhereTheyAre) {
  EXPECT_EQ(ThroughV("%d%s", 1, "a"), "1a 1a");
}

}  // namespace
