#include "net/virtual/link.h"

#include <algorithm>

namespace sim {
namespace {

constexpr std::size_t kDatagramHeaders = 42;  // Ethernet, IP, UDP
constexpr std::size_t kSegmentHeaders = 54;   // Ethernet, IP, TCP
constexpr int kMostRetransmissions = 8;

}  // namespace

// SplitMix64, one sequence a link: what is sent elsewhere does not change what happens here.
std::uint64_t Link::Random() {
  std::uint64_t mixed = (random_ += 0x9E3779B97F4A7C15U);
  mixed = (mixed ^ (mixed >> 30U)) * 0xBF58476D1CE4E5B9U;
  mixed = (mixed ^ (mixed >> 27U)) * 0x94D049BB133111EBU;
  return mixed ^ (mixed >> 31U);
}

bool Link::Chance(double probability) {
  if (probability <= 0) return false;
  constexpr double kStep = 1.0 / 9007199254740992.0;  // 2^-53
  return static_cast<double>(Random() >> 11U) * kStep < probability;
}

bool Link::Lost() {
  if (!in_burst_) in_burst_ = Chance(profile_.burst_begin);
  if (!in_burst_) return Chance(profile_.loss);
  const bool lost = Chance(profile_.burst_loss);
  in_burst_ = !Chance(profile_.burst_end);
  return lost;
}

/// When the last bit of a frame has left its host.
Micros Link::Depart(Micros now, std::size_t bytes) {
  if (profile_.bytes_per_second == 0) return now;
  const Micros takes(static_cast<Micros::rep>(bytes * 1000000 / profile_.bytes_per_second));
  free_at_ = std::max(now, free_at_) + takes;
  return free_at_;
}

Micros Link::Travel(Micros departure) {
  Micros arrival = departure + profile_.delay;
  if (profile_.jitter.count() > 0) {
    const auto range = static_cast<std::uint64_t>(profile_.jitter.count()) + 1;
    arrival += Micros(static_cast<Micros::rep>(Random() % range));
  }
  return arrival;
}

std::vector<Micros> Link::Datagram(Micros now, std::size_t bytes) {
  std::vector<Micros> arrivals;
  Datagram(now, bytes, arrivals);
  return arrivals;
}

void Link::Datagram(Micros now, std::size_t bytes, std::vector<Micros>& arrivals) {
  arrivals.clear();
  bytes += kDatagramHeaders;
  if (profile_.queue_bytes > 0 && profile_.bytes_per_second > 0 && free_at_ > now) {
    const auto waiting =
        static_cast<std::uint64_t>((free_at_ - now).count()) * profile_.bytes_per_second / 1000000;
    if (waiting + bytes > profile_.queue_bytes) return;
  }
  const Micros departure = Depart(now, bytes);
  if (Lost()) return;
  Micros arrival = Travel(departure);
  if (Chance(profile_.reorder)) {
    arrival += profile_.reorder_delay;
  } else {
    arrival = last_arrival_ = std::max(arrival, last_arrival_);
  }
  arrivals.push_back(arrival);
  if (Chance(profile_.duplicate)) arrivals.push_back(std::max(Travel(departure), arrival));
}

Micros Link::Segment(Micros now, std::size_t bytes) {
  bytes += kSegmentHeaders;
  Micros sent = now;
  Micros pause = profile_.retransmission;
  for (int tries = 0; Lost() && tries < kMostRetransmissions; ++tries) {
    Depart(sent, bytes);
    sent += pause;
    pause *= 2;
  }
  return Travel(Depart(sent, bytes));
}

std::vector<std::function<void()>> Link::Release() {
  stalled_ = false;
  return std::exchange(held_, {});
}

}  // namespace sim
