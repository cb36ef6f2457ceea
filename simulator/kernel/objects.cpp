#include "kernel/objects.h"

#include <algorithm>

namespace sim {

bool EventObject::Take(SimThread& /*thread*/) {
  if (!manual_reset_) set_ = false;
  return false;
}

void EventObject::Set() {
  set_ = true;
  Offer();
}

void EventObject::Pulse() {
  Set();
  set_ = false;
}

MutexObject::~MutexObject() {
  ForgetOwner();
}

bool MutexObject::Take(SimThread& thread) {
  if (owner_ == nullptr) {
    owner_ = &thread;
    thread.end_listeners.push_back(this);
  }
  ++depth_;
  const bool abandoned = abandoned_;
  abandoned_ = false;
  return abandoned;
}

bool MutexObject::Release(SimThread& thread) {
  if (owner_ != &thread) return false;
  if (--depth_ > 0) return true;
  ForgetOwner();
  Offer();
  return true;
}

void MutexObject::ThreadEnded(SimThread& /*thread*/) {
  owner_ = nullptr;
  depth_ = 0;
  abandoned_ = true;
  Offer();
}

void MutexObject::ForgetOwner() {
  if (owner_ == nullptr) return;
  auto& told = owner_->end_listeners;
  told.erase(std::remove(told.begin(), told.end(), this), told.end());
  owner_ = nullptr;
}

bool SemaphoreObject::Take(SimThread& /*thread*/) {
  --count_;
  return false;
}

bool SemaphoreObject::Release(LONG count, LONG& previous) {
  if (count > maximum_ - count_) return false;
  previous = count_;
  count_ += count;
  Offer();
  return true;
}

}  // namespace sim
