#include "server/multicast/closing.h"

#include <algorithm>

namespace server {
namespace {

using mcftp::Role;
using State = Device::Closing;

constexpr Micros kLeastWait = std::chrono::milliseconds(10);
/// No frame that arrives at all is so much later than others.
constexpr Micros kLateness = std::chrono::milliseconds(150);
constexpr Micros kFirstWait = std::chrono::milliseconds(200);
/// Who lets so many questions pass makes room for others.
constexpr std::uint32_t kSilentTries = 2;

}  // namespace

void Closing::Begin(std::optional<Micros> last_question_at, Micros now) {
  if (last_question_at) quiet_until_ = *last_question_at + kLateness;
  OnTime(now);
}

void Closing::NextGroup(Micros now) {
  group_.clear();
  stage_ = Stage::kAsking;
  to_send_ = 0;
  sendings_ = 0;
  Fill(now);
  done_ = group_.empty();
}

/// Silent devices do not keep others out of the group, and those that were silent before come last.
void Closing::Fill(Micros now) {
  std::size_t answering = 0;
  for (const Device* device : group_) {
    if (device->tries <= kSilentTries) ++answering;
  }
  for (const bool deferred : {false, true}) {
    for (Device& device : desk_.devices()) {
      if (answering >= desk_.options().poll_group) return;
      if (device.settled() || device.deferred != deferred || InGroup(device)) continue;
      ++answering;
      device.closing = State::kAsked;
      device.sends = 0;
      if (!deferred) device.tries = 0;
      group_.push_back(&device);
      Ask(device, now);
    }
    if (!group_.empty()) return;
  }
}

bool Closing::InGroup(const Device& device) const {
  return std::find(group_.begin(), group_.end(), &device) != group_.end();
}

void Closing::Ask(Device& device, Micros now) {
  desk_.GiveRole(device, device.closing == State::kClosed ? Role::kNakMaster : Role::kAckMaster,
                 now);
  device.asked_at = now;
  if (++device.tries == 1) device.unanswered_since = now;
}

std::size_t Closing::Count(State state) const {
  return static_cast<std::size_t>(
      std::count_if(group_.begin(), group_.end(),
                    [state](const Device* device) { return device->closing == state; }));
}

// ---- what comes back ----

void Closing::OnNak(Device& device, std::uint32_t block, Micros now) {
  if (!InGroup(device)) return;
  if (device.closing == State::kClosed) {
    Bury(device,
         block < log_.count() ? "has given the file up"
                              : "has closed the file, nobody knows whether with its last block",
         now);
    Go(now);
  } else if (now >= device.asked_at + Wait(device)) {
    Ask(device, now);  // it has not taken the role
  }
}

/// Not in the file any more: it may be asked to name what it lacks, which would complete it if it
/// were.
void Closing::AskClosed(Device& device, Micros now) {
  device.closing = State::kClosed;
  device.tries = 0;
  Ask(device, now);
}

void Closing::OnAck(Device& device, std::uint32_t block, Micros now) {
  // Also of a device that waits for its turn again: it may have taken the role without our hearing.
  if (block == log_.guard() && log_.sent_at(block) != BlockLog::kNever) device.has_guard = true;
  if (!InGroup(device)) return;
  if (block == log_.count()) {
    const bool to_block = device.closing == State::kUncertain && device.tries == 0;
    // In its dally it has the last block; that it has the guard, too, it must have said before.
    const bool in_dally = device.closing == State::kClosed && (device.has_guard || device.recalled);
    if (device.closing == State::kClosed && !in_dally) {
      Bury(device, "has closed the file, nobody knows whether with every block", now);
      Go(now);
    } else if (to_block || in_dally) {
      desk_.SetProven(device, now);
      Go(now);
    } else {
      AskClosed(device, now);
    }
  } else if (block == 0 && device.tries > 0) {
    if (device.tries == 1) device.round_trip.Add(now - device.asked_at);
    if (device.closing == State::kAsked) {
      // With one block there is no guard to wait for.
      Answered(device, log_.count() == 1 ? State::kHasGuard : State::kReady, now);
    } else if (device.closing == State::kUncertain) {
      Answered(device, State::kLacksLast, now);
    } else if (device.closing != State::kClosed) {
      device.tries = 0;
    }
  } else if (block == log_.guard() && block != 0 && device.closing <= State::kReady) {
    if (sendings_ == 1) device.round_trip.Add(now - sent_at_);
    Answered(device, State::kHasGuard, now);
  }
}

void Closing::OnJoin(Device& device, Micros now) {
  // The network may have made a second request of the first. Nobody begins anew so late, but if one
  // did, it would acknowledge the last blocks and lack the others.
  const bool repeated = now - device.first_joined_at <= desk_.options().oack_wait;
  if (!InGroup(device) || device.closing == State::kAsked || repeated) return;
  Bury(device, "asked for the file again while it was being closed", now);
  Go(now);
}

void Closing::Answered(Device& device, State state, Micros now) {
  device.closing = state;
  device.tries = 0;
  if (state == State::kHasGuard) {
    device.sends = 0;
    device.has_guard = true;  // with one block there is none to lack
  }
  Go(now);
}

void Closing::OnGivenUp(Device& /*device*/, Micros now) {
  Go(now);
}

/// Goes as far as what is known of the group allows.
void Closing::Go(Micros now) {
  if (!begun_) return;
  group_.erase(std::remove_if(group_.begin(), group_.end(),
                              [](const Device* device) { return device->settled(); }),
               group_.end());
  if (group_.empty()) {
    NextGroup(now);
    return;
  }
  if (stage_ == Stage::kAsking && Count(State::kClosed) == 0 && AllHaveAnswered()) {
    stage_ = Stage::kGuard;
    if (Count(State::kReady) > 0) to_send_ = log_.guard();
  }
  if (stage_ == Stage::kGuard && Count(State::kAsked) + Count(State::kReady) == 0) {
    stage_ = Stage::kLast;
    to_send_ = log_.count();
  }
  if (stage_ == Stage::kLast && to_send_ == 0 && Count(State::kLacksLast) > 0 &&
      Count(State::kUncertain) + Count(State::kClosed) == 0) {
    to_send_ = log_.count();
  }
}

/// Whether the group can go on. Those that answer no more are left for the end.
bool Closing::AllHaveAnswered() {
  if (Count(State::kAsked) == 0) return true;
  const auto is_silent = [this](const Device* device) {
    return device->closing == State::kAsked && device->tries > desk_.options().elect_tries;
  };
  const auto silent =
      static_cast<std::size_t>(std::count_if(group_.begin(), group_.end(), is_silent));
  if (silent == group_.size() || silent < Count(State::kAsked)) return false;
  for (Device* device : group_) device->deferred = device->deferred || is_silent(device);
  group_.erase(std::remove_if(group_.begin(), group_.end(), is_silent), group_.end());
  return true;
}

std::uint32_t Closing::TakeBlock(Micros now) {
  const std::uint32_t block = to_send_;
  to_send_ = 0;
  sent_at_ = now;
  log_.Sent(block, now);
  if (stage_ == Stage::kGuard) ++sendings_;
  for (Device* device : group_) {
    if (stage_ == Stage::kLast && device->closing != State::kClosed) {
      device->closing = State::kUncertain;
      device->tries = 0;
      ++device->sends;
    }
    if (stage_ == Stage::kGuard && device->closing == State::kReady) ++device->sends;
    if (stage_ == Stage::kGuard && device->closing == State::kReady && device->tries++ == 0) {
      device->unanswered_since = now;
    }
  }
  CheckUnreached(now);
  return block;
}

/// Gives up devices that answer questions and no blocks.
void Closing::CheckUnreached(Micros now) {
  for (Device* device : group_) {
    if (device->sends <= kMostSends || device->closing == State::kClosed) continue;
    desk_.SetReleased(*device, "hears questions and no blocks", now);
  }
  if (std::any_of(group_.begin(), group_.end(), [](const Device* d) { return d->settled(); })) {
    Go(now);
  }
}

// ---- time ----

Micros Closing::Wait(const Device& device) const {
  const Micros most = desk_.options().nak_wait;
  const Micros once =
      device.round_trip.known() ? std::max(device.round_trip.Bound(), kLeastWait) : kFirstWait;
  return std::min(once * (1U << std::min(device.tries, 8U)), most);
}

bool Closing::IsSilent(const Device& device, Micros now) const {
  return device.tries >= desk_.options().elect_tries &&
         now - device.unanswered_since >= desk_.options().silence_limit;
}

void Closing::Bury(Device& device, const char* why, Micros now) {
  desk_.SetDead(device, why, now);
}

/// When the device has kept us waiting long enough; nothing while it has nothing to say.
std::optional<Micros> Closing::DueAt(const Device& device) const {
  if (to_send_ != 0) return std::nullopt;
  const bool waiting = device.closing == State::kAsked || device.closing == State::kUncertain ||
                       device.closing == State::kClosed ||
                       (stage_ == Stage::kGuard && device.closing == State::kReady);
  if (!waiting) return std::nullopt;
  const bool block_out = stage_ != Stage::kAsking;
  const Micros since = block_out ? std::max(device.asked_at, sent_at_) : device.asked_at;
  return since + Wait(device);
}

void Closing::OnTime(Micros now) {
  if (!begun_) {
    // Roles are given when no late question can take them back any more.
    begun_ = now >= quiet_until_;
    if (begun_) NextGroup(now);
    return;
  }
  bool guard_due = false;
  for (Device* device : group_) {
    const auto due = DueAt(*device);
    if (!due || now < *due) continue;
    if (IsSilent(*device, now)) {
      const bool last = device->closing == State::kUncertain || device->closing == State::kClosed;
      Bury(*device,
           last ? "does not say whether it has the last block"
                : "does not answer at the end of the file",
           now);
    } else {
      // Its role may have been taken back by a frame that was late.
      Ask(*device, now);
      guard_due = guard_due || stage_ == Stage::kGuard;
    }
  }
  if (guard_due) to_send_ = log_.guard();
  if (stage_ == Stage::kAsking && !group_.empty()) Fill(now);
  if (!group_.empty()) Go(now);
}

std::optional<Micros> Closing::deadline(Micros /*now*/) const {
  std::optional<Micros> earliest;
  if (!begun_) return quiet_until_;
  if (to_send_ != 0) return std::nullopt;
  for (const Device* device : group_) earliest = Earlier(earliest, DueAt(*device));
  return earliest;
}

}  // namespace server
