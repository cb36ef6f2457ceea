#include "device/device.h"

#include <cstdio>
#include <cstdlib>
#include <utility>

#include "driver/drivers.h"
#include "faults/faults.h"
#include "kernel/debug.h"
#include "kernel/handle_table.h"
#include "kernel/kernel.h"
#include "library/libraries.h"
#include "library/management_queue.h"
#include "locale/clock.h"
#include "memory/memory.h"
#include "net/network.h"
#include "power/power.h"
#include "process/processes.h"
#include "registry/registry.h"
#include "storage/storage.h"
#include "trace/trace.h"
#include "window/screen.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace sim {

Device::Device(World& world, Profile profile, std::filesystem::path folder)
    : world_(world),
      profile_(std::move(profile)),
      folder_(std::move(folder)),
      start_ticks_(StartTicks(profile_)),
      faults_(std::make_unique<Faults>()),
      trace_(std::make_unique<Trace>()),
      handles_(std::make_unique<HandleTable>()),
      debug_(std::make_unique<Debug>(*this)),
      kernel_(std::make_unique<Kernel>(*this)),
      memory_(std::make_unique<Memory>(*this)),
      storage_(std::make_unique<Storage>(*this)),
      registry_(std::make_unique<Registry>(*this)),
      power_(std::make_unique<Power>(*this)),
      processes_(std::make_unique<Processes>(*this)),
      network_(std::make_unique<Network>(*this)),
      screen_(std::make_unique<Screen>(*this)),
      libraries_(std::make_unique<Libraries>(*this)),
      messages_(std::make_unique<ManagementQueue>(*this)),
      drivers_(std::make_unique<Drivers>(*this)) {}

// No thread may still use a part when it goes, and what handles stand for goes before the parts.
Device::~Device() {
  world_.EndThreads(*this);
  const World::Lock lock = world_.Acquire();
  handles_->Clear();
}

Device& Device::Current(const char* what) {
  const SimThread* thread = World::Current();
  if (thread == nullptr || thread->device == nullptr) {
    std::fprintf(stderr, "cesim: %s called by a thread that belongs to no simulated device\n",
                 what);
    std::abort();
  }
  return *thread->device;
}

}  // namespace sim
