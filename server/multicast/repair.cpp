#include "server/multicast/repair.h"

#include <algorithm>

namespace server {
namespace {

using mcftp::Role;

constexpr Micros kLeastBound = std::chrono::milliseconds(4);
/// So many gaps named one after the other are taken for the middle of a long gap.
constexpr std::uint32_t kRun = 4;
constexpr std::uint32_t kMostAhead = 16;
/// A device that is the only one of its run holds nobody back.
constexpr double kPatienceWithOne = 10;
constexpr std::uint64_t kFreeRepairs = 64;
constexpr std::uint32_t kQuickTries = 4;
constexpr std::uint32_t kFirstWindow = 4;
/// Groups of devices that may be in ours, most of them silent.
constexpr std::size_t kSilentShare = 16;
/// Who lets so many questions pass makes room for others, and is asked on.
constexpr std::uint32_t kSilentTries = 2;
constexpr Micros kFirstBound = std::chrono::milliseconds(200);

}  // namespace

void Repair::Begin(std::uint32_t window, Micros now) {
  window_ = kFirstWindow;
  window_limit_ = std::max(window, kFirstWindow);
  for (Device& device : desk_.devices()) {
    if (log_.guard() <= 1) device.whole = true;  // there is nothing that could be missing yet
  }
  Fill(now);
}

void Repair::OnJoin(Micros now) {
  Fill(now);
}

/// Silent devices do not keep others out of the group.
void Repair::Fill(Micros now) {
  std::size_t answering = 0;
  for (const Device* device : group_) {
    if (device->tries <= kSilentTries) ++answering;
  }
  const std::size_t most = desk_.options().poll_group;
  bool waiting = !group_.empty();
  for (Device& device : desk_.devices()) {
    if (device.settled() || device.whole || device.in_group) continue;
    waiting = true;
    if (answering >= most || group_.size() >= most * kSilentShare) break;
    ++answering;
    device.in_group = true;
    device.tries = 0;
    device.named_at = Micros(0);
    group_.push_back(&device);
    Ask(device, now);
  }
  done_ = !waiting;
  if (group_.size() == 1) alone_since_ = now;
}

void Repair::Ask(Device& device, Micros now) {
  desk_.GiveRole(device, Role::kNakMaster, now);
  last_question_at_ = now;
  device.asked_at = now;
  if (++device.tries == 1) device.unanswered_since = now;
}

void Repair::Remove(Device& device, Micros now) {
  if (!device.in_group) return;
  device.in_group = false;
  group_.erase(std::find(group_.begin(), group_.end(), &device));
  chosen_ = 0;
  Fill(now);
}

void Repair::OnGivenUp(Device& device, Micros now) {
  Remove(device, now);
}

/// A device in NAK mode that acknowledges has been sent into ACK mode by its own record of an
/// overrun: it has to be asked again. One that acknowledges a block that never went out has closed
/// the file: it may do so when it had named its last block in a file of the same length before.
void Repair::OnAck(Device& device, std::uint32_t block, Micros now) {
  if (!device.in_group || now - device.asked_at <= Bound(device)) return;
  if (block == log_.count() && log_.sent_at(block) == BlockLog::kNever) {
    desk_.SetReleased(device, "has closed the file before it had every block", now);
    Remove(device, now);
  } else if (IsSilent(device, now)) {
    desk_.SetDead(device, "acknowledges instead of saying what it lacks", now);
    Remove(device, now);
  } else {
    Ask(device, now);
  }
}

bool Repair::IsSilent(const Device& device, Micros now) const {
  return device.tries >= desk_.options().nak_tries &&
         now - device.unanswered_since >= desk_.options().silence_limit;
}

void Repair::OnNak(Device& device, std::uint32_t block, Micros now) {
  if (!device.in_group || block < device.position) return;  // late: it has got further since
  if (block > log_.guard()) {
    desk_.SetDead(device, "names a block behind the one that nobody has: it means another file",
                  now);
    Remove(device, now);
    return;
  }
  if (device.tries == 1 && device.asked_at > device.named_at) {
    const bool sent_since = device.position > 0 && log_.sent_at(device.position) >= device.asked_at;
    if (!sent_since) device.round_trip.Add(now - device.asked_at);
  }
  device.tries = 0;
  if (block > device.position) Advance(device, block, now);
  device.named_at = now;
  device.figures.loss =
      std::max(device.figures.loss, static_cast<double>(device.gaps) / device.position);
  if (block < log_.guard()) return;
  device.whole = true;
  desk_.Changed(device);
  desk_.GiveRole(device, Role::kPassive, now);
  Remove(device, now);
}

void Repair::Advance(Device& device, std::uint32_t block, Micros now) {
  // Only the block can have brought the answer, if it went out once and was not asked after.
  if (device.sends == 1 && device.asked_at < log_.sent_at(device.position)) {
    device.round_trip.Add(now - log_.sent_at(device.position));
  }
  window_ = std::min(window_ + 1, window_limit_);
  alone_since_ = now;
  device.run = block == device.position + 1 ? device.run + 1 : 0;
  if (device.position > 0) ++device.gaps;
  device.position = block;
  device.sends = block <= device.ahead ? 1 : 0;
}

// ---- blocks ----

Micros Repair::Bound(const Device& device) const {
  const Micros most = desk_.options().nak_wait;
  if (!device.round_trip.known()) return std::min(kFirstBound, most);
  // Twice the round trip: a queue on the way grows while we send.
  const Micros bound = std::max(device.round_trip.Bound(), 2 * device.round_trip.smoothed());
  return std::clamp(bound, kLeastBound, most);
}

/// Whether the block that the device has named is missing for certain, and not only under way.
bool Repair::IsLacking(const Device& device) const {
  if (device.position == 0 || device.named_at.count() == 0) return false;
  const Micros sent = log_.sent_at(device.position);
  return sent == BlockLog::kNever || device.named_at >= sent + Bound(device);
}

/// Further blocks that the device cannot have: they went out before it came, or lie in the middle
/// of a long gap by all appearances.
std::uint32_t Repair::ChooseAhead(Device& device) const {
  if (device.position == 0 || device.tries > 0) return 0;
  device.ahead = std::max(device.ahead, device.position);
  while (device.ahead + 1 < log_.guard()) {
    const std::uint32_t block = device.ahead + 1;
    const bool before_it_came = log_.sent_at(block) < device.joined_at;
    const bool in_gap =
        device.run >= kRun && block <= device.position + std::min(device.run / 2, kMostAhead);
    if (before_it_came || in_gap) return block;
    if (!device.figures.late) return 0;
    ++device.ahead;
  }
  return 0;
}

void Repair::Forget(Micros now) {
  while (!on_way_.empty() && on_way_.front() <= now) on_way_.pop_front();
}

std::uint32_t Repair::Choose(Micros now) {
  Forget(now);
  if (on_way_.size() >= window_) return 0;
  for (std::size_t i = 0; i < group_.size(); ++i) {
    const Device& device = *group_[(turn_ + i) % group_.size()];
    if (IsLacking(device)) return device.position;
  }
  for (std::size_t i = 0; i < group_.size(); ++i) {
    Device& device = *group_[(turn_ + i) % group_.size()];
    if (const std::uint32_t block = ChooseAhead(device); block != 0) return block;
  }
  return 0;
}

bool Repair::HasBlock(Micros now) {
  if (chosen_ == 0) chosen_ = Choose(now);
  return chosen_ != 0;
}

std::uint32_t Repair::TakeBlock(Micros now) {
  const std::uint32_t block = chosen_;
  chosen_ = 0;
  ++turn_;
  log_.Sent(block, now);
  Micros slowest{0};
  Device* only = group_.size() == 1 ? group_.front() : nullptr;
  for (Device* device : group_) {
    if (device->position == block) ++device->sends;
    if (device->ahead + 1 == block) device->ahead = block;
    slowest = std::max(slowest, device->tries == 0 ? Bound(*device) : Micros(0));
  }
  on_way_.push_back(now + std::max(slowest, kLeastBound));
  if (only != nullptr) {
    ++only->alone;
    CheckHopeless(*only, now);
  }
  CheckUnreached(block, now);
  return block;
}

/// Gives up devices that name a block again and again, though it goes out: they have left the file,
/// or hear questions and no blocks.
void Repair::CheckUnreached(std::uint32_t block, Micros now) {
  const std::vector<Device*> group = group_;
  for (Device* device : group) {
    if (device->position != block || device->sends <= kMostSends) continue;
    desk_.SetReleased(*device, "names block " + std::to_string(block) + " again and again", now);
    Remove(*device, now);
  }
}

void Repair::CheckHopeless(Device& device, Micros now) {
  const MulticastOptions& options = desk_.options();
  const double patience = desk_.devices().size() > 1 ? 1 : kPatienceWithOne;
  const double most = options.release_share * log_.count() * patience + kFreeRepairs;
  const auto longest = Micros(
      static_cast<std::int64_t>(static_cast<double>(options.release_after.count()) * patience));
  if (static_cast<double>(device.alone) < most && now - alone_since_ < longest) return;
  desk_.SetReleased(device,
                    "needs more repairs than it is worth: block " +
                        std::to_string(device.position) + " of " + std::to_string(log_.count()),
                    now);
  Remove(device, now);
}

// ---- time ----

/// When the device is to be asked again, if it says nothing until then.
Micros Repair::AskAt(const Device& device) const {
  if (IsLacking(device)) return Micros::max();  // it is our turn
  Micros since = std::max(device.asked_at, device.named_at);
  if (device.position > 0) since = std::max(since, log_.sent_at(device.position));
  // The first few questions follow each other quickly: it is more likely that one was lost than
  // that the device is gone.
  const unsigned doublings = std::clamp(device.tries, kQuickTries, kQuickTries + 8) - kQuickTries;
  return since + std::min(Bound(device) * (1U << doublings), desk_.options().nak_wait);
}

void Repair::OnTime(Micros now) {
  Forget(now);
  const std::vector<Device*> group = group_;  // who is given up leaves it
  for (Device* device : group) {
    if (now < AskAt(*device)) continue;
    if (IsSilent(*device, now)) {
      desk_.SetDead(*device, "does not say what it lacks", now);
      Remove(*device, now);
      continue;
    }
    Ask(*device, now);
    if (device->tries == kSilentTries + 1) Fill(now);
  }
}

std::optional<Micros> Repair::deadline(Micros now) {
  std::optional<Micros> earliest;
  for (const Device* device : group_) {
    if (!IsLacking(*device)) earliest = Earlier(earliest, AskAt(*device));
  }
  Forget(now);
  if (on_way_.size() >= window_) earliest = Earlier(earliest, on_way_.front());
  return earliest;
}

}  // namespace server
