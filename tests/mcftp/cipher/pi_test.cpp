#include "mcftp/cipher/pi.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

namespace {

constexpr std::size_t kWords = 18 + 4 * 256;
constexpr std::size_t kGuard = 4;  // words for what the divisions round off

/// A number with 32 bits in front of the point (word 0) and the rest behind it.
using Fixed = std::vector<std::uint32_t>;

/// @return whether anything is left.
bool Divide(Fixed& number, std::uint32_t by) {
  std::uint64_t rest = 0;
  std::uint32_t any = 0;
  for (std::uint32_t& word : number) {
    const std::uint64_t dividend = rest << 32 | word;
    word = static_cast<std::uint32_t>(dividend / by);
    rest = dividend % by;
    any |= word;
  }
  return any != 0;
}

/// Adds or subtracts, modulo what the words hold.
void Add(Fixed& to, const Fixed& number, bool subtract) {
  std::uint64_t carry = subtract ? 1 : 0;
  for (std::size_t i = to.size(); i-- > 0;) {
    carry += to[i];
    carry += subtract ? ~number[i] : number[i];
    to[i] = static_cast<std::uint32_t>(carry);
    carry >>= 32;
  }
}

/// Adds `times` * arctan(1 / n) by its series, or subtracts it.
void AddArcTangent(Fixed& to, std::uint32_t times, std::uint32_t n, bool subtract) {
  Fixed power(to.size());
  power[0] = times;
  Divide(power, n);
  for (std::uint32_t k = 1;; k += 2) {
    Fixed term = power;
    Divide(term, k);
    Add(to, term, subtract);
    subtract = !subtract;
    if (!Divide(power, n * n)) return;
  }
}

TEST(PiScheduleTest, IsTheDigitsOfPi) {
  Fixed pi(1 + kWords + kGuard);
  AddArcTangent(pi, 16, 5, /*subtract=*/false);
  AddArcTangent(pi, 4, 239, /*subtract=*/true);
  ASSERT_EQ(pi[0], 3U);

  std::size_t at = 1;
  for (const std::uint32_t word : mcftp::kPiSchedule.subkeys) EXPECT_EQ(word, pi[at++]);
  for (const auto& box : mcftp::kPiSchedule.boxes) {
    for (const std::uint32_t word : box) EXPECT_EQ(word, pi[at++]);
  }
  EXPECT_EQ(at, 1 + kWords);
}

}  // namespace
