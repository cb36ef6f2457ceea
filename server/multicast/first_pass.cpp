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
/// Questions to a candidate when there are others who may be asked.
constexpr std::uint32_t kQuickTries = 2;
constexpr std::size_t kLargestWave = 16;
/// Blocks that nobody acknowledged: with fewer a device may just be slow.
constexpr std::uint32_t kVainBlocks = 5;

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
  BeginElection(now);
  ElectNext(now);
}

void FirstPass::Resume(std::uint32_t next, Micros now) {
  next_ = next;
  from_start_ = false;
  Begin(now);
}

// ---- the master ----

void FirstPass::BeginElection(Micros now) {
  for (const InFlight& flying : flight_) lacking_.insert(flying.block);
  flight_.clear();
  if (electing_) return;
  electing_ = true;
  ++election_;
  election_began_ = now;
  wave_size_ = 1;
}

bool FirstPass::AnyUnasked() const {
  const std::deque<Device>& devices = desk_.devices();
  return std::any_of(devices.begin(), devices.end(), [this](const Device& device) {
    return !device.settled() && !device.deaf && device.election != election_;
  });
}

bool FirstPass::IsAsked(const Device& device) const {
  return electing_ && std::find(wave_.begin(), wave_.end(), &device) != wave_.end();
}

/// Offers the mastership to those who have not been asked in this election: to one, and when that
/// one is silent to more and more at once. No block goes out meanwhile.
void FirstPass::ElectNext(Micros now) {
  EndWave(nullptr, now);
  if (!AnyUnasked()) {
    const bool over = now - election_began_ >= desk_.options().silence_limit;
    ++election_;
    if (over || !AnyUnasked()) {
      Finish(now);  // nobody answers; the repair asks them all once more
      return;
    }
  }
  for (Device& device : desk_.devices()) {
    if (wave_.size() == wave_size_) break;
    if (device.settled() || device.deaf || device.election == election_) continue;
    device.election = election_;
    wave_.push_back(&device);
  }
  wave_size_ = std::min(wave_size_ * 4, kLargestWave);
  tries_ = 0;
  Ask(now);
}

void FirstPass::Elect(Device& candidate, Micros now) {
  BeginElection(now);
  EndWave(&candidate, now);
  candidate.election = election_;
  wave_ = {&candidate};
  tries_ = 0;
  Ask(now);
}

void FirstPass::EndWave(const Device* winner, Micros now) {
  for (Device* asked : wave_) {
    if (asked != winner && !asked->settled()) desk_.GiveRole(*asked, Role::kPassive, now);
  }
  wave_.clear();
}

void FirstPass::Ask(Micros now) {
  for (Device* device : wave_) desk_.GiveRole(*device, Role::kAckMaster, now);
  asked_at_ = now;
  ++tries_;
}

void FirstPass::BecomeMaster(Device& device, Micros now) {
  EndWave(&device, now);
  electing_ = false;
  from_start_ = from_start_ && (next_ == 1 || &device == master_);
  if (&device != master_) {
    MeasureAnew(now);
    lost_ = 0;
    vain_elections_ = 0;
    vain_blocks_ = 0;
    progress_at_ = now;
    lacking_.clear();  // nothing is known of what the new one lacks
    if (master_ != nullptr) window_ = SendWindow(desk_.options().window, desk_.block_size());
  }
  ++vain_elections_;
  master_ = &device;
  window_.SetAlone(desk_.devices().size() == 1);
  desk_.TellMaster(*master_, now);
}

void FirstPass::Replace(Device& by, Micros now) {
  if (!electing_) desk_.GiveRole(*master_, Role::kPassive, now);
  Elect(by, now);
}

/// It answers when it is asked, and blocks do not reach it.
void FirstPass::GiveUpMaster(Micros now) {
  Device& master = *master_;
  master.deaf = true;
  lacking_.clear();
  from_start_ = false;
  desk_.GiveRole(master, Role::kPassive, now);
  BeginElection(now);
  ElectNext(now);
}

void FirstPass::CheckDeaf(Micros now) {
  if (done_ || electing_) return;
  const MulticastOptions& options = desk_.options();
  const bool long_in_vain =
      vain_blocks_ >= kVainBlocks && now - progress_at_ >= options.silence_limit;
  if (vain_elections_ > options.elect_tries || long_in_vain) GiveUpMaster(now);
}

void FirstPass::OnNak(Device& device, Micros now) {
  if (&device == master_ && !electing_ && now - asked_at_ > Patience()) {
    desk_.GiveRole(device, Role::kAckMaster, now);
    asked_at_ = now;
  }
}

void FirstPass::OnOverrun(Device& device, std::uint16_t percent_x100, Micros now) {
  if (device.figures.late || master_ == nullptr || done_) return;
  window_.Reduce();
  if (&device == master_ || IsAsked(device)) return;
  // Lowering the pace has not helped, or will not: it sets the pace itself.
  if (device.figures.overruns > 1 || percent_x100 < kHopelessPercent) Replace(device, now);
}

void FirstPass::OnGivenUp(Device& device, Micros now) {
  if (done_ || (&device != master_ && !IsAsked(device))) return;
  BeginElection(now);
  ElectNext(now);
}

/// A master that asks for the file may have begun anew.
void FirstPass::OnJoin(Device& device, Micros now) {
  window_.SetAlone(desk_.devices().size() == 1);
  if (&device != master_ || done_) return;
  from_start_ = false;
  if (!electing_) Elect(device, now);
}

void FirstPass::OnRate(Micros now) {
  best_rate_ = 0;
  measured_acks_ = 0;
  MeasureAnew(now);
}

// ---- what comes back ----

void FirstPass::OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) {
  if (done_) return;
  if (IsAsked(device)) {
    if (ack.block == log_.count()) {
      // No client says this of a file whose last block never went out: it means another one.
      desk_.SetDead(device, "has given the file up", now);
      ElectNext(now);
      return;
    }
    if (ack.block == 0 && tries_ == 1) device.round_trip.Add(now - asked_at_);
    BecomeMaster(device, now);
  }
  if (&device != master_ || electing_) return;
  if (ack.block != 0) Acknowledged(ack.block, ack.duplicate, now);
  Measure(now);
  CheckDeaf(now);
  CheckEnd(now);
}

void FirstPass::Acknowledged(std::uint32_t block, bool duplicate, Micros now) {
  const bool was_lacking = lacking_.erase(block) > 0;
  const auto at = std::find_if(flight_.begin(), flight_.end(),
                               [block](const InFlight& flying) { return flying.block == block; });
  const bool expected = at != flight_.end() || was_lacking;
  // A block that it has twice was sent again in vain, unless it was the network that doubled it.
  if (duplicate && again_.erase(block) > 0) ++wasted_;
  if (expected) {
    vain_elections_ = 0;
    vain_blocks_ = 0;
    progress_at_ = now;
  }
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
  slow.deaf = true;  // it is asked last
  BeginElection(now);
  ElectNext(now);
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
  if (done_) return;
  if (!electing_) Measure(now);
  CheckDeaf(now);
  if (done_) return;
  if (electing_) {
    ElectionTimeout(now);
    return;
  }
  // Blocks that are paced expire one by one, and each makes room for another: so silence is told by
  // when the master was heard, not by an empty way.
  bool silent = false;
  bool lost_now = false;
  const Micros patience = Patience();
  while (!flight_.empty() && now >= flight_.front().sent_at + patience) {
    lost_now = true;
    silent = master_->heard_at <= flight_.front().sent_at;
    Lost(flight_.front());
    flight_.pop_front();
  }
  if (lost_now) backoff_ = std::min(backoff_ + 1, kMostBackoff);
  if (silent) {
    window_.OnSilence();
    Elect(*master_, now);
  } else {
    CheckEnd(now);
  }
}

void FirstPass::ElectionTimeout(Micros now) {
  const MulticastOptions& options = desk_.options();
  if (now < asked_at_ + options.elect_wait) return;
  const std::uint32_t most = AnyUnasked() ? kQuickTries : options.elect_tries;
  if (tries_ < most) {
    Ask(now);
  } else {
    ElectNext(now);
  }
}

std::optional<Micros> FirstPass::deadline() const {
  if (done_) return std::nullopt;
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
  if (again) {
    lacking_.erase(block);
    again_.insert(block);
  }
  flight_.push_back({block, now, again, 0});
  log_.Sent(block, now);
  ++vain_blocks_;
  desk_.figures().window = window_.size();
  desk_.figures().round_trip = window_.round_trip().smoothed();
  return block;
}

void FirstPass::CheckEnd(Micros now) {
  if (!done_ && !electing_ && next_ >= end_ && flight_.empty() && !MayRepeat()) Finish(now);
}

void FirstPass::Finish(Micros now) {
  done_ = true;
  EndWave(nullptr, now);
  if (master_ == nullptr || master_->settled()) return;
  master_->figures.loss = static_cast<double>(lost_) / std::max<double>(next_, 1);
  if (!electing_ && from_start_ && lacking_.empty()) {
    master_->whole = true;
    master_->position = log_.guard();
  }
  // It would go on acknowledging what others get.
  if (!electing_ && Unsettled(desk_.devices()) > 1) desk_.GiveRole(*master_, Role::kPassive, now);
}

}  // namespace server
