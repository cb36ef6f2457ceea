// Waits for handles: who gets a signalled object, and in which order.
#include <algorithm>

#include "ce/kernel.h"
#include "kernel/handle_table.h"
#include "world/sim_thread.h"

namespace sim {

void KernelObject::Offer() {
  // Satisfying a wait takes it off no list before its thread has run, so the loop stays valid.
  for (ObjectWait* wait : waits_) {
    if (wait->thread_.terminate || wait->result_) continue;
    if (wait->TrySatisfy()) wait->thread_.world->Notify(wait->satisfied_);
  }
}

ObjectWait::ObjectWait(SimThread& thread, Objects objects, bool all)
    : thread_(thread), objects_(std::move(objects)), all_(all) {
  for (const auto& object : objects_) object->waits_.push_back(this);
}

ObjectWait::~ObjectWait() {
  for (const auto& object : objects_) {
    auto& waits = object->waits_;
    waits.erase(std::remove(waits.begin(), waits.end(), this), waits.end());
  }
}

bool ObjectWait::TrySatisfy() {
  if (!result_) static_cast<void>(all_ ? TakeAll() : TakeFirst());
  return result_.has_value();
}

bool ObjectWait::TakeFirst() {
  for (std::size_t i = 0; i < objects_.size(); ++i) {
    if (!objects_[i]->Signalled(thread_)) continue;
    const bool abandoned = objects_[i]->Take(thread_);
    result_ = (abandoned ? WAIT_ABANDONED_0 : WAIT_OBJECT_0) + static_cast<std::uint32_t>(i);
    return true;
  }
  return false;
}

bool ObjectWait::TakeAll() {
  for (const auto& object : objects_) {
    if (!object->Signalled(thread_)) return false;
  }
  bool abandoned = false;
  for (const auto& object : objects_) abandoned = object->Take(thread_) || abandoned;
  result_ = abandoned ? WAIT_ABANDONED_0 : WAIT_OBJECT_0;
  return true;
}

std::uint32_t ObjectWait::Run(World& world, World::Lock& lock, std::optional<Micros> deadline) {
  const auto had = [this] { return TrySatisfy(); };
  if (had()) return *result_;
  if (deadline && *deadline <= world.now()) {
    world.Yield(lock);
    return had() ? *result_ : WAIT_TIMEOUT;
  }
  World::Queues queues{&satisfied_};
  for (const auto& object : objects_) queues.push_back(&object->wait_queue());
  return world.WaitUntil(lock, queues, deadline, had) ? *result_ : WAIT_TIMEOUT;
}

}  // namespace sim
