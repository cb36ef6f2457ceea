// What happens to frames on their way from one host to another.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <utility>
#include <vector>

#include "world/world.h"

namespace sim {

/// One direction of the way between two hosts. The default is a perfect link: nothing is lost and
/// nothing takes time. Probabilities are 0 to 1 and fall by the world's seed.
struct LinkProfile {
  Micros delay{0};
  Micros jitter{0};  ///< up to so much more delay; never changes the order

  std::uint64_t bytes_per_second = 0;  ///< of frames with their headers; 0: no limit
  std::uint32_t queue_bytes = 0;  ///< datagrams that find more waiting are dropped; 0: no limit

  /// Of a datagram. A TCP segment that is lost comes `retransmission` later, and so do those
  /// behind it.
  double loss = 0;
  /// Bursts: with each frame one may begin; while it lasts, `burst_loss` counts instead of `loss`;
  /// after each of its frames it may end.
  double burst_begin = 0;
  double burst_end = 1;
  double burst_loss = 1;
  double duplicate = 0;  ///< a datagram arrives twice
  double reorder = 0;    ///< a datagram is held back, and later ones overtake it
  Micros reorder_delay = std::chrono::milliseconds(10);

  std::uint32_t segment_bytes = 1460;  ///< longest TCP segment
  Micros segment_gap{0};               ///< pause between two segments of a connection
  Micros retransmission = std::chrono::milliseconds(200);  ///< doubles with each further loss
};

/// The state of one direction. Frames are asked for in the order in which they are sent.
class Link {
 public:
  explicit Link(std::uint64_t seed) : random_(seed) {}

  [[nodiscard]] const LinkProfile& profile() const { return profile_; }
  void set_profile(const LinkProfile& profile) { profile_ = profile; }

  /// When the copies of a datagram of `bytes` arrive: none when it is lost.
  std::vector<Micros> Datagram(Micros now, std::size_t bytes);
  /// The same, into `arrivals` in place of what is there: for those who ask a thousand links.
  void Datagram(Micros now, std::size_t bytes, std::vector<Micros>& arrivals);
  /// When a segment of `bytes` arrives, its retransmissions included.
  Micros Segment(Micros now, std::size_t bytes);

  [[nodiscard]] bool stalled() const { return stalled_; }
  void Stall() { stalled_ = true; }
  /// Keeps what to do with a segment for the end of the stall.
  void Hold(std::function<void()> send) { held_.push_back(std::move(send)); }
  /// Ends the stall. @return what was held, in order.
  std::vector<std::function<void()>> Release();

 private:
  Micros Depart(Micros now, std::size_t bytes);
  Micros Travel(Micros departure);
  bool Lost();
  bool Chance(double probability);
  std::uint64_t Random();

  LinkProfile profile_;
  std::uint64_t random_;
  bool in_burst_ = false;
  bool stalled_ = false;
  Micros free_at_{0};       ///< when the last frame has left
  Micros last_arrival_{0};  ///< of those that keep the order
  std::vector<std::function<void()>> held_;
};

}  // namespace sim
