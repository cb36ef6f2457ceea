#include "server/multicast/lock_step.h"

#include <algorithm>

namespace server {
namespace {

constexpr Micros kJoinTime = std::chrono::seconds(30);

}  // namespace

using mcftp::Role;

void LockStep::Begin(Micros now) {
  desk_.SetPhase(FilePhase::kStreaming, now);
  ElectNext(now);
}

void LockStep::Resume(std::uint32_t first_unsent, bool last_sent, Micros now) {
  first_unsent_ = first_unsent;
  next_ = std::min(first_unsent, desk_.block_count());
  if (last_sent) {
    Drain(now);
  } else {
    Begin(now);
  }
}

/// A new device is found when its turn comes. One that asks again may have begun anew: it has gaps.
void LockStep::OnJoin(Device& device, Micros /*now*/) {
  device.may_have_gaps = true;
  if (&device == subject_ && phase_ == Phase::kStream) has_gaps_ = true;
}

/// Those who come too late would keep all others waiting, one after the other.
bool LockStep::takes_devices(Micros now) const {
  if (phase_ == Phase::kDrain) return now - drain_began_ < kJoinTime;
  return phase_ != Phase::kDone;
}

// ---- choosing a master ----

void LockStep::ElectNext(Micros now) {
  for (Device& device : desk_.devices()) {
    if (!device.settled()) {
      Elect(device, now);
      return;
    }
  }
  Finish();
}

void LockStep::Elect(Device& candidate, Micros now) {
  phase_ = Phase::kElect;
  subject_ = &candidate;
  tries_ = 0;
  to_send_.clear();
  Ask(Role::kAckMaster, now);
}

void LockStep::Ask(Role role, Micros now) {
  desk_.GiveRole(*subject_, role, now);
  ++tries_;
  timer_ = now + (role == Role::kNakMaster ? desk_.options().nak_wait : desk_.options().elect_wait);
  timer_at_send_ = false;
}

void LockStep::BecomeMaster(Micros now) {
  phase_ = Phase::kStream;
  old_master_ = nullptr;
  has_gaps_ = std::max<std::uint32_t>(subject_->position, 1) < next_;
  subject_->may_have_gaps = subject_->may_have_gaps || has_gaps_;
  desk_.TellMaster(*subject_, now);
  GoOn(now);
}

// ---- streaming ----

void LockStep::GoOn(Micros now) {
  tries_ = 0;
  asking_last_ = false;
  if (!overruns_.empty()) {
    Repair(now);
  } else if (has_gaps_ && next_ == desk_.block_count()) {
    desk_.GiveRole(*subject_, Role::kPassive, now);
    Drain(now);
  } else {
    sent_once_ = next_ >= first_unsent_;
    Send(next_);
  }
}

void LockStep::Send(std::uint32_t block) {
  to_send_.push_back(block);
  timer_.reset();
  timer_at_send_ = true;
}

void LockStep::OnMasterAck(std::uint32_t block, Micros now) {
  if (block != next_) return;  // also a second acknowledgement of the same block: nothing is resent
  if (sent_once_ && !asking_last_) subject_->round_trip.Add(now - sent_at_);
  to_send_.clear();
  if (!has_gaps_) subject_->position = next_ + 1;
  if (next_ == desk_.block_count()) {
    desk_.SetProven(*subject_, now);
    Drain(now);
    return;
  }
  ++next_;
  GoOn(now);
}

void LockStep::OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) {
  if (&device != subject_) return;
  const bool has_last = ack.block == desk_.block_count();
  switch (phase_) {
    case Phase::kElect:
      if (ack.block == 0) {
        BecomeMaster(now);
      } else if (has_last && first_unsent_ > ack.block && !device.may_have_gaps) {
        desk_.SetProven(device, now);
        Drain(now);
      } else if (has_last) {
        desk_.SetReleased(device, "has closed the file before it had every block", now);
        ElectNext(now);
      }
      break;
    case Phase::kStream:
      if (ack.block == 0 && asking_last_) {  // it never came: now it may be sent again
        asking_last_ = false;
        sent_once_ = false;
        Send(next_);
      } else {
        OnMasterAck(ack.block, now);
      }
      break;
    case Phase::kRepair:
      if (has_last) {
        desk_.SetReleased(device, "has closed the file before it had every block", now);
        EndRepair(now);
      } else {
        AskAgain(now);
      }
      break;
    case Phase::kDrain:
      if (has_last && device.may_have_gaps) {
        desk_.SetReleased(device, "has closed the file before it had every block", now);
        DrainNext(now);
      } else if (has_last) {
        desk_.SetProven(device, now);
        DrainNext(now);
      } else {
        AskAgain(now);
      }
      break;
    case Phase::kDone: break;
  }
}

// ---- devices that say what they lack ----

/// A device in NAK mode that acknowledges was sent into ACK mode by its own record of an overrun.
/// What it says may still be on its way from before: it is not asked for every frame.
void LockStep::AskAgain(Micros now) {
  const MulticastOptions& options = desk_.options();
  if (tries_ >= options.nak_tries || now - subject_->spoken_to_at < options.ack_wait_min) return;
  Ask(Role::kNakMaster, now);
}

/// Whether the device has named this block so often that it will not get it: it has left the file,
/// or hears questions and no blocks. Then it is given up.
bool LockStep::NamesInVain(Device& device, std::uint16_t block, Micros now) {
  device.sends = block == device.position ? device.sends + 1 : 0;
  if (device.sends < kMostSends) return false;
  desk_.SetReleased(device, "names block " + std::to_string(block) + " again and again", now);
  return true;
}

void LockStep::OnNak(Device& device, std::uint16_t block, Micros now) {
  if (&device != subject_ || block < device.position) return;  // late: it has got further since
  if (NamesInVain(device, block, now)) {
    OnGivenUp(device, now);
    return;
  }
  device.position = block;
  to_send_.clear();
  switch (phase_) {
    case Phase::kElect: break;
    case Phase::kStream:
      // It is not in ACK mode as it should be.
      next_ = block;
      Elect(device, now);
      break;
    case Phase::kRepair:
      tries_ = 0;
      device.may_have_gaps = false;
      if (const auto report = overruns_.find(&device);
          report != overruns_.end() && block < report->second.block) {
        Send(block);
      } else {
        overruns_.erase(&device);
        next_ = block;
        if (block == desk_.block_count()) {
          Elect(device, now);  // it may have closed the file with that: its answer will tell
        } else {
          BecomeMaster(now);  // from its reported block on it acknowledges, without having said so
        }
      }
      break;
    case Phase::kDrain:
      tries_ = 0;
      device.may_have_gaps = false;
      if (block < desk_.block_count()) {
        Send(block);
      } else {
        desk_.SetProven(device, now);
        DrainNext(now);
      }
      break;
    case Phase::kDone: break;
  }
}

void LockStep::OnOverrun(Device& device, std::uint16_t percent_x100, std::uint16_t block,
                         Micros now) {
  if (device.figures.late || phase_ == Phase::kDrain || phase_ == Phase::kDone) return;
  overruns_[&device] = {percent_x100, block};
  if (phase_ == Phase::kStream && &device != subject_) Repair(now);
}

void LockStep::Repair(Micros now) {
  const auto worst = std::min_element(
      overruns_.begin(), overruns_.end(),
      [](const auto& a, const auto& b) { return a.second.percent_x100 < b.second.percent_x100; });
  to_send_.clear();
  old_master_ = subject_;
  subject_ = worst->first;
  phase_ = Phase::kRepair;
  tries_ = 0;
  if (old_master_ != subject_) desk_.GiveRole(*old_master_, Role::kPassive, now);
  Ask(Role::kNakMaster, now);
}

// ---- the rest of the devices ----

void LockStep::Drain(Micros now) {
  desk_.SetPhase(FilePhase::kRepairing, now);
  phase_ = Phase::kDrain;
  drain_began_ = now;
  overruns_.clear();
  last_went_out_ = Micros(-1);
  DrainNext(now);
}

void LockStep::DrainNext(Micros now) {
  subject_ = nullptr;
  tries_ = 0;
  timer_.reset();
  timer_at_send_ = false;
  to_send_.clear();
  for (Device& device : desk_.devices()) {
    if (device.settled()) continue;
    if (last_went_out_.count() < 0 || device.joined_at > last_went_out_) {
      // Not asked before it has had the chance to get the last block.
      to_send_ = {desk_.block_count(), desk_.block_count()};
    } else {
      subject_ = &device;
      Ask(Role::kNakMaster, now);
    }
    return;
  }
  Finish();
}

void LockStep::Finish() {
  phase_ = Phase::kDone;
  timer_.reset();
  to_send_.clear();
}

void LockStep::OnGivenUp(Device& device, Micros now) {
  overruns_.erase(&device);
  if (&device == old_master_) old_master_ = nullptr;
  if (&device != subject_) return;
  to_send_.clear();
  switch (phase_) {
    case Phase::kElect: ElectNext(now); break;
    case Phase::kStream: Drain(now); break;
    case Phase::kRepair: EndRepair(now); break;
    case Phase::kDrain: DrainNext(now); break;
    case Phase::kDone: break;
  }
}

void LockStep::EndRepair(Micros now) {
  if (old_master_ != nullptr && !old_master_->settled()) {
    Elect(*old_master_, now);
  } else {
    ElectNext(now);
  }
}

// ---- time ----

Micros LockStep::AckWait() const {
  const MulticastOptions& options = desk_.options();
  if (!subject_->round_trip.known()) return options.ack_wait;
  return std::clamp(4 * subject_->round_trip.smoothed(), options.ack_wait_min,
                    options.ack_wait_max);
}

void LockStep::OnTime(Micros now) {
  if (!timer_ || now < *timer_) return;
  timer_.reset();
  switch (phase_) {
    case Phase::kElect: ElectTimeout(now); break;
    case Phase::kStream: StreamTimeout(now); break;
    case Phase::kRepair:
    case Phase::kDrain: NakTimeout(now); break;
    case Phase::kDone: break;
  }
}

void LockStep::ElectTimeout(Micros now) {
  if (tries_ < desk_.options().elect_tries) {
    Ask(Role::kAckMaster, now);
    return;
  }
  desk_.SetDead(*subject_, "does not take the mastership", now);
  ElectNext(now);
}

void LockStep::StreamTimeout(Micros now) {
  if (++tries_ >= desk_.options().ack_tries) {
    desk_.SetDead(*subject_, "does not acknowledge block " + std::to_string(next_), now);
    Drain(now);
  } else if (next_ == desk_.block_count()) {
    asking_last_ = true;
    desk_.GiveRole(*subject_, Role::kAckMaster, now);
    timer_ = now + AckWait();
  } else {
    sent_once_ = false;
    Send(next_);
  }
}

void LockStep::NakTimeout(Micros now) {
  if (tries_ < desk_.options().nak_tries) {
    Ask(Role::kNakMaster, now);
    return;
  }
  Device& silent = *subject_;
  overruns_.erase(&silent);
  desk_.SetDead(silent, "does not say what it lacks", now);
  if (phase_ == Phase::kRepair) {
    EndRepair(now);
  } else {
    DrainNext(now);
  }
}

// ---- blocks ----

bool LockStep::HasBlock(Micros /*now*/) {
  return !to_send_.empty();
}

std::uint32_t LockStep::TakeBlock(Micros now) {
  const std::uint32_t block = to_send_.front();
  to_send_.pop_front();
  first_unsent_ = std::max(first_unsent_, block + 1);
  sent_at_ = now;
  if (block == desk_.block_count()) last_went_out_ = now;
  if (timer_at_send_) {
    timer_ = now + (phase_ == Phase::kStream ? AckWait() : desk_.options().nak_wait);
    timer_at_send_ = false;
  }
  if (to_send_.empty() && phase_ == Phase::kDrain && subject_ == nullptr) DrainNext(now);
  return block;
}

std::optional<Micros> LockStep::deadline(Micros /*now*/) {
  return timer_;
}

}  // namespace server
