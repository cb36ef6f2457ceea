#include "server/multicast/first_pass.h"

#include <algorithm>

namespace server {
namespace {

using mcftp::Role;

/// A block that so many later ones have overtaken is lost, not late.
constexpr std::uint32_t kOvertakers = 3;
constexpr Micros kLeastPatience = std::chrono::milliseconds(10);
/// Below this share, in hundredths of a percent, one report is enough.
constexpr std::uint16_t kHopelessPercent = 5000;
/// A master that has become one because it is slow may be so much slower than the best.
constexpr double kSlowest = 10;
constexpr std::uint32_t kSlowMeasures = 5;
/// Acknowledgements that make a rate, and not only a burst.
constexpr std::uint32_t kEnoughAcks = 16;
constexpr unsigned kMostBackoff = 8;

std::uint32_t Unsettled(std::deque<Device>& devices) {
  return static_cast<std::uint32_t>(std::count_if(
      devices.begin(), devices.end(), [](const Device& device) { return !device.settled(); }));
}

}  // namespace

FirstPass::FirstPass(TransferDesk& desk, BlockLog& log)
    : desk_(desk),
      log_(log),
      window_(desk.options().window, desk.block_size()),
      end_(std::max<std::uint32_t>(log.guard(), 1)) {}

void FirstPass::Begin(Micros now) {
  if (next_ >= end_) {
    done_ = true;  // all blocks are held back, or have gone out
    return;
  }
  ElectAfter(nullptr, now);
}

void FirstPass::Resume(std::uint32_t next, Micros now) {
  next_ = next;
  from_start_ = false;
  Begin(now);
}

// ---- the master ----

void FirstPass::ElectAfter(const Device* last, Micros now) {
  std::deque<Device>& devices = desk_.devices();
  std::size_t start = 0;
  for (std::size_t i = 0; i < devices.size(); ++i) {
    if (&devices[i] == last) start = i + 1;
  }
  for (std::size_t i = 0; i < devices.size(); ++i) {
    Device& device = devices[(start + i) % devices.size()];
    if (device.settled()) continue;
    Elect(device, now);
    return;
  }
  Finish();
}

void FirstPass::Elect(Device& candidate, Micros now) {
  if (!electing_ || master_ == nullptr) election_began_ = now;
  from_start_ = from_start_ && (next_ == 1 || &candidate == master_);
  for (const InFlight& flying : flight_) lacking_.insert(flying.block);
  flight_.clear();
  if (&candidate != master_) {
    MeasureAnew(now);
    lost_ = 0;
  }
  if (master_ != nullptr && &candidate != master_) {
    lacking_.clear();  // nothing is known of what the new one lacks
    window_ = SendWindow(desk_.options().window, desk_.block_size());
  }
  electing_ = true;
  master_ = &candidate;
  tries_ = 0;
  Ask(now);
}

void FirstPass::Ask(Micros now) {
  desk_.GiveRole(*master_, Role::kAckMaster, now);
  asked_at_ = now;
  ++tries_;
}

void FirstPass::BecomeMaster(Micros now) {
  electing_ = false;
  window_.SetAlone(desk_.devices().size() == 1);
  desk_.TellMaster(*master_, now);
}

void FirstPass::Replace(Device& by, Micros now) {
  desk_.GiveRole(*master_, Role::kPassive, now);
  Elect(by, now);
}

void FirstPass::OnNak(Device& device, Micros now) {
  if (&device == master_ && !electing_ && now - asked_at_ > Patience()) Ask(now);
}

void FirstPass::OnOverrun(Device& device, std::uint16_t percent_x100, Micros now) {
  if (device.figures.late || master_ == nullptr) return;
  window_.Reduce();
  if (&device == master_) return;
  // Lowering the pace has not helped, or will not: it sets the pace itself.
  if (device.figures.overruns > 1 || percent_x100 < kHopelessPercent) Replace(device, now);
}

void FirstPass::OnGivenUp(Device& device, Micros now) {
  if (&device == master_ && !done_) ElectAfter(master_, now);
}

// ---- what comes back ----

void FirstPass::OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) {
  if (&device != master_ || done_) return;
  if (electing_) {
    if (ack.block == log_.count()) {
      // No client says this of a file whose last block never went out: it means another one.
      desk_.SetDead(device, "has given the file up", now);
      ElectAfter(&device, now);
      return;
    }
    if (ack.block == 0 && tries_ == 1) master_->round_trip.Add(now - asked_at_);
    BecomeMaster(now);
  }
  if (ack.block != 0) Acknowledged(ack.block, ack.duplicate, now);
  Measure(now);
  CheckEnd();
}

void FirstPass::Acknowledged(std::uint32_t block, bool duplicate, Micros now) {
  lacking_.erase(block);
  if (duplicate) ++wasted_;
  const auto at = std::find_if(flight_.begin(), flight_.end(),
                               [block](const InFlight& flying) { return flying.block == block; });
  if (at == flight_.end()) return;
  if (!at->again) {
    window_.OnAck(at->sent_at, now);
    backoff_ = 0;
  }
  ++measured_acks_;
  const auto index = static_cast<std::size_t>(at - flight_.begin());
  flight_.erase(at);
  for (std::size_t i = 0; i < index; ++i) ++flight_[i].overtaken;
  while (!flight_.empty() && flight_.front().overtaken >= kOvertakers) {
    Lost(flight_.front());
    flight_.pop_front();
  }
}

void FirstPass::Lost(const InFlight& gone) {
  lacking_.insert(gone.block);
  ++lost_;
  window_.OnLoss();
}

double FirstPass::MeasuredRate(Micros now) const {
  const auto span = static_cast<double>(std::max((now - measure_began_).count(), Micros::rep{1}));
  return measured_acks_ * 1e6 / span;
}

void FirstPass::MeasureAnew(Micros now) {
  if (measured_acks_ >= kEnoughAcks) best_rate_ = std::max(best_rate_, MeasuredRate(now));
  measure_began_ = now;
  measured_acks_ = 0;
  slow_measures_ = 0;
}

/// Gives up a master that holds all others back.
void FirstPass::Measure(Micros now) {
  if (now - measure_began_ < std::chrono::seconds(1)) return;
  const double rate = MeasuredRate(now);
  best_rate_ = std::max(best_rate_, rate);
  slow_measures_ = rate * kSlowest < best_rate_ ? slow_measures_ + 1 : 0;
  measure_began_ = now;
  measured_acks_ = 0;
  if (slow_measures_ < kSlowMeasures || Unsettled(desk_.devices()) < 2) return;
  Device& slow = *master_;
  if (slow.figures.overruns > 0) {
    desk_.SetReleased(slow, "is more than ten times slower than others", now);
  } else {
    desk_.GiveRole(slow, Role::kPassive, now);
  }
  ElectAfter(&slow, now);
}

// ---- time ----

Micros FirstPass::Patience() const {
  const MulticastOptions& options = desk_.options();
  if (!window_.round_trip().known()) return options.ack_wait;
  // Answers to blocks that went out twice measure nothing: until there are others, patience grows.
  const Micros bound = std::max(window_.round_trip().Bound(), 2 * window_.round_trip().smoothed());
  return std::min(std::max(bound, kLeastPatience) * (1U << backoff_), options.ack_wait_max);
}

void FirstPass::OnTime(Micros now) {
  if (done_ || master_ == nullptr) return;
  Measure(now);
  if (done_) return;
  if (electing_) {
    if (now < asked_at_ + desk_.options().elect_wait) return;
    if (tries_ < desk_.options().elect_tries) {
      Ask(now);
    } else if (now - election_began_ >= desk_.options().silence_limit) {
      Finish();  // nobody answers; the repair asks them all once more
    } else {
      Device* silent = master_;
      if (Unsettled(desk_.devices()) > 1) desk_.GiveRole(*silent, Role::kPassive, now);
      ElectAfter(silent, now);
    }
    return;
  }
  // Blocks that are paced expire one by one, and each makes room for another: so silence is told by
  // when the master was heard, not by an empty way.
  bool silent = false;
  const Micros patience = Patience();
  while (!flight_.empty() && now >= flight_.front().sent_at + patience) {
    backoff_ = std::min(backoff_ + 1, kMostBackoff);
    silent = master_->heard_at <= flight_.front().sent_at;
    Lost(flight_.front());
    flight_.pop_front();
  }
  if (silent) {
    window_.OnSilence();
    Elect(*master_, now);
  } else {
    CheckEnd();
  }
}

std::optional<Micros> FirstPass::deadline() const {
  if (done_ || master_ == nullptr) return std::nullopt;
  if (electing_) return asked_at_ + desk_.options().elect_wait;
  if (flight_.empty()) return std::nullopt;
  return flight_.front().sent_at + Patience();
}

// ---- blocks ----

bool FirstPass::MayRepeat() const {
  // Every fiftieth block may go out in vain; beyond that the device is asked what it lacks.
  return !lacking_.empty() && wasted_ * 50 <= log_.count() && Unsettled(desk_.devices()) == 1;
}

bool FirstPass::HasBlock() const {
  if (done_ || electing_ || flight_.size() >= window_.size()) return false;
  return next_ < end_ || MayRepeat();
}

std::uint32_t FirstPass::TakeBlock(Micros now) {
  const bool again = MayRepeat();
  const std::uint32_t block = again ? *lacking_.begin() : next_++;
  if (again) lacking_.erase(block);
  flight_.push_back({block, now, again, 0});
  log_.Sent(block, now);
  desk_.figures().window = window_.size();
  desk_.figures().round_trip = window_.round_trip().smoothed();
  return block;
}

void FirstPass::CheckEnd() {
  if (!electing_ && next_ >= end_ && flight_.empty() && !MayRepeat()) Finish();
}

void FirstPass::Finish() {
  done_ = true;
  if (master_ == nullptr) return;
  master_->figures.loss = static_cast<double>(lost_) / std::max<double>(next_, 1);
  if (!electing_ && from_start_ && lacking_.empty()) {
    master_->whole = true;
    master_->position = log_.guard();
  }
}

}  // namespace server
