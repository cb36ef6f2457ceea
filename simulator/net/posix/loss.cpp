#include "net/posix/loss.h"

namespace sim {
namespace {

constexpr double kRange = 4294967296.0;

/// SplitMix64: every seed gives a good row, 0 and 1 as well.
std::uint32_t NextNumber(std::uint64_t& state) {
  state += 0x9E3779B97F4A7C15U;
  std::uint64_t mixed = state;
  mixed = (mixed ^ (mixed >> 30U)) * 0xBF58476D1CE4E5B9U;
  mixed = (mixed ^ (mixed >> 27U)) * 0x94D049BB133111EBU;
  return static_cast<std::uint32_t>((mixed ^ (mixed >> 31U)) >> 32U);
}

}  // namespace

DatagramLoss::DatagramLoss(double percent, std::uint64_t seed)
    : limit_(percent / 100 * kRange), state_(seed) {}

bool DatagramLoss::Next() {
  const bool lost = static_cast<double>(NextNumber(state_)) < limit_;
  if (lost) ++lost_;
  return lost;
}

}  // namespace sim
