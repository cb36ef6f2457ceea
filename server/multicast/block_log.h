// When each block of a file went out.
#pragma once

#include <cstdint>
#include <vector>

#include "server/moment.h"

namespace server {

/// The latest sending of each block, and which blocks are held back.
///
/// A client that is asked what it lacks completes its file as soon as it has nothing else to name
/// than the last block, whether it has that one or not. So the last block but one, the guard, stays
/// back with the last until every device is known to have all the others: while the guard is
/// missing nobody completes, and nobody names the last block.
class BlockLog {
 public:
  explicit BlockLog(std::uint32_t block_count) : sent_at_(block_count + 1, kNever) {}

  static constexpr Micros kNever{-1};

  [[nodiscard]] std::uint32_t count() const {
    return static_cast<std::uint32_t>(sent_at_.size() - 1);
  }
  /// The block that is held back with the last one; 0 when there is but one.
  [[nodiscard]] std::uint32_t guard() const { return count() - 1; }
  /// kNever for a block that never went out.
  [[nodiscard]] Micros sent_at(std::uint32_t block) const { return sent_at_[block]; }
  void Sent(std::uint32_t block, Micros now) { sent_at_[block] = now; }

 private:
  std::vector<Micros> sent_at_;
};

}  // namespace server
