#include "server/multicast/send_window.h"

#include <algorithm>

namespace server {
namespace {

constexpr double kFirstSize = 4;
constexpr double kLeastSize = 2;
/// Of a device's receive buffer, which holds 32 KiB: what may wait in it, in bytes.
constexpr double kQueue = 22'400;
constexpr double kTry = 1.1;
constexpr double kBack = 0.6;

}  // namespace

SendWindow::SendWindow(std::uint32_t limit, std::uint16_t block_size)
    : limit_(std::max<std::uint32_t>(limit, 1)),
      queue_(std::max(2.0, kQueue / block_size)),
      queue_allowed_(queue_),
      queue_most_(limit_),
      size_(std::min(kFirstSize, limit_)) {}

void SendWindow::OnAck(Micros sent_at, Micros now) {
  const Micros sample = std::max(now - sent_at, Micros(1));
  round_trip_.Add(sample);
  ++acked_;
  round_least_ = round_least_.count() == 0 ? sample : std::min(round_least_, sample);
  if (sent_at < round_began_) return;
  EndRound();
  round_began_ = now;
}

void SendWindow::EndRound() {
  const double least = static_cast<double>(round_trip_.least().count());
  const double queued = size_ * (1 - least / static_cast<double>(round_least_.count()));
  const bool half_lost = lost_ > acked_;
  const bool queue_lost = lost_ * 10 > acked_ + lost_ && queued > queue_ / 2;
  if (lost_ > 0 && queued > queue_) {
    queue_most_ = std::max(queue_, std::min(queued, queue_allowed_) * kBack);
    queue_allowed_ = queue_most_;
  }
  if (half_lost || queue_lost) {
    Reduce();
  } else if (queued > queue_allowed_) {
    size_ -= std::max(1.0, size_ / 8);
    starting_ = false;
  } else if (queued < queue_allowed_ / 2) {
    size_ += starting_ ? size_ : std::max(1.0, size_ / 8);
  } else {
    starting_ = false;
    if (alone_ && lost_ == 0) queue_allowed_ = std::min(queue_allowed_ * kTry, queue_most_);
  }
  size_ = std::clamp(size_, std::min(kLeastSize, limit_), limit_);
  acked_ = 0;
  lost_ = 0;
  round_least_ = Micros(0);
}

void SendWindow::Reduce() {
  size_ = std::max(size_ * 0.7, std::min(kLeastSize, limit_));
  starting_ = false;
}

void SendWindow::OnSilence() {
  size_ = std::min(kLeastSize, limit_);
  starting_ = true;
}

}  // namespace server
