#include "server/multicast/announcer.h"

#include <algorithm>

#include "mcftp/wire/frames.h"

namespace server {
namespace {

std::uint32_t Milliseconds(Micros wait) {
  return static_cast<std::uint32_t>(
      std::chrono::duration_cast<std::chrono::milliseconds>(wait).count());
}

}  // namespace

void Announcer::Announce(Micros now) {
  const MulticastFile& file = *plan_.file;
  mcftp::Announcement announcement;
  announcement.last_file = plan_.last_file;
  announcement.block_size = plan_.blocks.block_size;
  announcement.file_size = file.content->size();
  announcement.oack_wait_ms = std::max(Milliseconds(options_.oack_wait), 1U);
  announcement.attributes = file.attributes;
  announcement.transfer_id = plan_.transfer_id;
  file.time_stamp.copy(announcement.time_stamp, mcftp::kTimeStampWidth);
  announcement.server_port = plan_.own.port;
  announcement.server_address = plan_.own.address;
  announcement.step_percent = options_.step_percent;
  announcement.step_kib = options_.step_kib;
  announcement.file_name = file.device_path;
  announcement.masks = file.masks;
  outbox_.Announce(options_.public_group, announcement);
  ++figures_.announcements;
  last_copy_ = now;
  copy_at_ = now + options_.announce_interval;
}

bool Announcer::IsEnough(std::size_t asked, Micros now) const {
  const StartPolicy& start = plan_.start;
  const bool copy_is_old = IsCopyDue(now);
  const bool minimal = figures_.announcements >= options_.announce_min && copy_is_old;
  if (start_now_) return now >= AnsweredAt(asked);
  if (is_empty_file()) return minimal;
  if (start.longest_wait.count() > 0) {
    if (now >= figures_.began + start.longest_wait) return true;
  } else if (figures_.announcements >= options_.announce_max && copy_is_old) {
    return true;
  }
  if (asked == 0 || asked < start.minimum) return false;
  if (start.expected > 0 && asked >= start.expected) return now >= AnsweredAt(asked);
  const bool quiet = last_join_ <= last_copy_;
  return (start.expected == 0 || plan_.begins_when_quiet) && minimal && quiet;
}

/// When every device that has asked must have its answer: who has not asks again. The first blocks
/// would go past it. A single device says so itself when it is made master.
Micros Announcer::AnsweredAt(std::size_t asked) const {
  if (asked <= 1) return last_join_;
  return last_request_ + options_.oack_wait + options_.oack_wait / 8;
}

Micros Announcer::deadline(std::size_t asked) const {
  Micros ends = copy_at_;
  const StartPolicy& start = plan_.start;
  if (start.longest_wait.count() > 0) ends = std::min(ends, figures_.began + start.longest_wait);
  const bool all_here = start.expected > 0 && asked >= std::max(start.expected, start.minimum);
  if (start_now_ || (!is_empty_file() && all_here)) ends = std::min(ends, AnsweredAt(asked));
  return ends;
}

}  // namespace server
