#include "tools/fleet/fleet.h"

namespace fleet {

sim::LinkProfile Plan::DefaultLink() {
  sim::LinkProfile link;
  link.delay = std::chrono::microseconds(500);
  link.bytes_per_second = 12'500'000;
  return link;
}

std::string Noise(std::size_t size, std::uint64_t seed) {
  std::string bytes(size, '\0');
  std::uint64_t state = seed;
  for (char& byte : bytes) {
    state = state * 6364136223846793005U + 1442695040888963407U;
    byte = static_cast<char>(state >> 56U);
  }
  return bytes;
}

}  // namespace fleet
