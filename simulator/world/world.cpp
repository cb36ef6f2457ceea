#include "world/world.h"

#include <cstdio>
#include <cstdlib>
#include <utility>

#include "device/device.h"
#include "world/sim_thread.h"

namespace sim {

WaitQueue::~WaitQueue() {
  if (waiting_.empty()) return;
  std::fprintf(stderr, "cesim: a wait queue ended while thread \"%s\" waits on it\n",
               waiting_.front()->name.c_str());
  std::abort();
}

World::World(std::uint64_t seed) : seed_(seed), random_state_(seed) {}

World::~World() = default;

void World::EndShared() {
  shared_.clear();
}

// SplitMix64: every state gives a good number, so any seed will do.
std::uint64_t World::Random() {
  std::uint64_t mixed = (random_state_ += 0x9E3779B97F4A7C15U);
  mixed = (mixed ^ (mixed >> 30U)) * 0xBF58476D1CE4E5B9U;
  mixed = (mixed ^ (mixed >> 27U)) * 0x94D049BB133111EBU;
  return mixed ^ (mixed >> 31U);
}

double World::RandomUnit() {
  constexpr double kStep = 1.0 / 9007199254740992.0;  // 2^-53
  return static_cast<double>(Random() >> 11U) * kStep;
}

AttachedThread::AttachedThread(Device& device, std::string name)
    : world_(device.world()), thread_(&world_.Attach(device, std::move(name))) {}

AttachedThread::~AttachedThread() {
  world_.Detach(*thread_);
}

}  // namespace sim
