#include "server/multicast/pipeline.h"

#include <algorithm>

namespace server {
namespace {

constexpr Micros kLeastJoinTime = std::chrono::seconds(30);

}  // namespace

void Pipeline::Begin(Micros now) {
  began_ = now;
  desk_.SetPhase(FilePhase::kStreaming, now);
  first_pass_.Begin(now);
  Go(now);
}

void Pipeline::Resume(std::uint32_t first_unsent, bool last_sent, Micros now) {
  for (std::uint32_t block = 1; block < first_unsent && block <= log_.count(); ++block) {
    log_.Sent(block, now);
  }
  if (last_sent) log_.Sent(log_.count(), now);
  began_ = now;
  desk_.SetPhase(FilePhase::kStreaming, now);
  first_pass_.Resume(first_unsent, now);
  Go(now);
}

void Pipeline::Go(Micros now) {
  if (step_ == Step::kFirstPass && first_pass_.done()) {
    step_ = Step::kRepair;
    joins_until_ = now + std::max(2 * (now - began_), kLeastJoinTime);
    desk_.SetPhase(FilePhase::kRepairing, now);
    repair_.Begin(first_pass_.window().size(), now);
  }
  if (step_ == Step::kRepair && repair_.done()) {
    step_ = Step::kClosing;
    desk_.SetPhase(FilePhase::kClosing, now);
    closing_.Begin(repair_.last_question_at(), now);
  }
  if (step_ == Step::kClosing && closing_.done()) step_ = Step::kDone;
}

/// Those who come too late would keep all others waiting, one after the other.
bool Pipeline::takes_devices(Micros now) const {
  return step_ == Step::kFirstPass || (step_ == Step::kRepair && now < joins_until_);
}

void Pipeline::OnJoin(Device& device, Micros now) {
  switch (step_) {
    case Step::kFirstPass: first_pass_.OnJoin(device, now); break;
    case Step::kRepair: repair_.OnJoin(now); break;
    case Step::kClosing: closing_.OnJoin(device, now); break;
    case Step::kDone: break;
  }
  Go(now);
}

void Pipeline::OnRate(Micros now) {
  if (step_ == Step::kFirstPass) first_pass_.OnRate(now);
}

void Pipeline::OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) {
  switch (step_) {
    case Step::kFirstPass: first_pass_.OnAck(device, ack, now); break;
    case Step::kRepair: repair_.OnAck(device, ack.block, now); break;
    case Step::kClosing: closing_.OnAck(device, ack.block, now); break;
    case Step::kDone: break;
  }
  Go(now);
}

void Pipeline::OnNak(Device& device, std::uint16_t block, Micros now) {
  switch (step_) {
    case Step::kFirstPass: first_pass_.OnNak(device, now); break;
    case Step::kRepair: repair_.OnNak(device, block, now); break;
    case Step::kClosing: closing_.OnNak(device, block, now); break;
    case Step::kDone: break;
  }
  Go(now);
}

void Pipeline::OnOverrun(Device& device, std::uint16_t percent_x100, std::uint16_t /*block*/,
                         Micros now) {
  if (step_ == Step::kFirstPass) first_pass_.OnOverrun(device, percent_x100, now);
}

void Pipeline::OnGivenUp(Device& device, Micros now) {
  switch (step_) {
    case Step::kFirstPass: first_pass_.OnGivenUp(device, now); break;
    case Step::kRepair: repair_.OnGivenUp(device, now); break;
    case Step::kClosing: closing_.OnGivenUp(device, now); break;
    case Step::kDone: break;
  }
  Go(now);
}

void Pipeline::OnTime(Micros now) {
  switch (step_) {
    case Step::kFirstPass: first_pass_.OnTime(now); break;
    case Step::kRepair: repair_.OnTime(now); break;
    case Step::kClosing: closing_.OnTime(now); break;
    case Step::kDone: break;
  }
  Go(now);
}

bool Pipeline::HasBlock(Micros now) {
  switch (step_) {
    case Step::kFirstPass: return first_pass_.HasBlock();
    case Step::kRepair: return repair_.HasBlock(now);
    case Step::kClosing: return closing_.HasBlock(now);
    case Step::kDone: return false;
  }
  return false;
}

std::uint32_t Pipeline::TakeBlock(Micros now) {
  std::uint32_t block = 0;
  switch (step_) {
    case Step::kFirstPass: block = first_pass_.TakeBlock(now); break;
    case Step::kRepair: block = repair_.TakeBlock(now); break;
    case Step::kClosing: block = closing_.TakeBlock(now); break;
    case Step::kDone: break;
  }
  Go(now);
  return block;
}

std::optional<Micros> Pipeline::deadline(Micros now) {
  switch (step_) {
    case Step::kFirstPass: return first_pass_.deadline();
    case Step::kRepair: return repair_.deadline(now);
    case Step::kClosing: return closing_.deadline(now);
    case Step::kDone: return std::nullopt;
  }
  return std::nullopt;
}

}  // namespace server
