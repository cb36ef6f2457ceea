// Announcing one file, and when that has been enough.
#pragma once

#include <cstddef>

#include "server/moment.h"
#include "server/multicast/outbox.h"
#include "server/multicast/session_plan.h"
#include "server/multicast_figures.h"
#include "server/multicast_options.h"

namespace server {

/// Sends the copies of a file's announcement, and holds the clock of those who answer it against
/// the policy by which the file begins.
class Announcer {
 public:
  Announcer(const MulticastOptions& options, const SessionPlan& plan, FileFigures& figures,
            Outbox& outbox)
      : options_(options), plan_(plan), figures_(figures), outbox_(outbox) {}

  /// Sends a copy.
  void Announce(Micros now);
  [[nodiscard]] bool IsCopyDue(Micros now) const { return now >= copy_at_; }

  /// A device has asked for the first time.
  void OnJoin(Micros now) { last_join_ = last_request_ = now; }
  /// ... for the second time: only so often does a device keep the start waiting.
  void OnSecondRequest(Micros now) { last_request_ = now; }
  /// From now on it is enough as soon as everybody who has asked has an answer.
  void StartNow() { start_now_ = true; }

  /// @param asked  devices that have asked for the file
  [[nodiscard]] bool IsEnough(std::size_t asked, Micros now) const;
  /// When IsEnough or IsCopyDue may hold next.
  [[nodiscard]] Micros deadline(std::size_t asked) const;

 private:
  [[nodiscard]] bool is_empty_file() const { return plan_.blocks.block_count == 0; }
  [[nodiscard]] Micros AnsweredAt(std::size_t asked) const;

  const MulticastOptions& options_;
  const SessionPlan& plan_;
  FileFigures& figures_;
  Outbox& outbox_;
  Micros copy_at_{0};    ///< when the next copy is due
  Micros last_copy_{0};  ///< when the latest went out
  Micros last_join_{0};
  Micros last_request_{0};
  bool start_now_ = false;
};

}  // namespace server
