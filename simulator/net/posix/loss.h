// Datagrams that a device on the host's sockets does not hear.
#pragma once

#include <cstdint>

namespace sim {

/// Loopback loses nothing, so a device's profile may say how much of what others send it is lost on
/// the way. One for all sockets of a device; world's lock held.
class DatagramLoss {
 public:
  /// @param percent  0 to 100
  /// @param seed     the same seed loses the same places in the row of datagrams
  DatagramLoss(double percent, std::uint64_t seed);

  [[nodiscard]] bool any() const { return limit_ > 0; }
  /// Whether the next datagram in the row is lost.
  bool Next();
  [[nodiscard]] std::uint64_t lost() const { return lost_; }

 private:
  const double limit_;  ///< of a number below 2^32
  std::uint64_t state_;
  std::uint64_t lost_ = 0;
};

}  // namespace sim
