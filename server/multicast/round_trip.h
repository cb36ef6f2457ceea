// How long a device takes to answer.
#pragma once

#include <algorithm>
#include <chrono>

#include "server/moment.h"

namespace server {

/// Smoothed round trip and its variation, as transport protocols keep them.
class RoundTrip {
 public:
  void Add(Micros sample) {
    sample = std::max(sample, Micros(1));
    least_ = known() ? std::min(least_, sample) : sample;
    if (!known()) {
      smoothed_ = sample;
      variation_ = sample / 2;
      return;
    }
    const Micros off = sample > smoothed_ ? sample - smoothed_ : smoothed_ - sample;
    variation_ += (off - variation_) / 4;
    smoothed_ += (sample - smoothed_) / 8;
  }

  [[nodiscard]] bool known() const { return smoothed_.count() > 0; }
  [[nodiscard]] Micros smoothed() const { return smoothed_; }
  [[nodiscard]] Micros least() const { return least_; }
  /// An answer that has not come within this time will not come, very likely.
  [[nodiscard]] Micros Bound() const { return smoothed_ + 4 * variation_; }

 private:
  Micros smoothed_{0};
  Micros variation_{0};
  Micros least_{0};
};

}  // namespace server
