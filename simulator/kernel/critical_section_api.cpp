#include <algorithm>
#include <cstdio>
#include <cstdlib>

#include "ce/kernel.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "kernel/kernel.h"
#include "world/sim_thread.h"

namespace sim {
namespace {

using Section = Kernel::Section;

/// The section goes to whoever has waited longest: a thread that leaves and enters again at once
/// could otherwise keep it for ever.
void HandOver(World& world, Section& section) {
  section.depth = 0;
  section.owner = nullptr;
  if (section.line.empty()) return;
  section.owner = section.line.front();
  section.line.pop_front();
  section.depth = 1;
  world.Notify(section.left);
}

/// A thread's place in the line; given up when the thread is terminated there.
class PlaceInLine {
 public:
  PlaceInLine(World& world, Section& section, SimThread& thread)
      : world_(world), section_(section), thread_(thread) {
    section_.line.push_back(&thread_);
  }
  ~PlaceInLine() {
    if (!thread_.leaving) return;
    if (section_.owner == &thread_) {
      HandOver(world_, section_);
    } else {
      section_.line.erase(std::find(section_.line.begin(), section_.line.end(), &thread_));
    }
  }
  PlaceInLine(const PlaceInLine&) = delete;
  PlaceInLine& operator=(const PlaceInLine&) = delete;

 private:
  World& world_;
  Section& section_;
  SimThread& thread_;
};

/// @return true when the section is the thread's now.
bool TakeIfFree(Section& section, SimThread& thread) {
  if (section.owner != nullptr && section.owner != &thread) return false;
  section.owner = &thread;
  ++section.depth;
  return true;
}

}  // namespace
}  // namespace sim

using sim::ApiCall;

extern "C" {

void InitializeCriticalSection(CRITICAL_SECTION* section) {
  ApiCall call("InitializeCriticalSection", sim::kCannotFail);
  const sim::World::Lock lock = call.world().Acquire();
  *section = {};
  call.device().kernel().AddSection(section);
}

void EnterCriticalSection(CRITICAL_SECTION* section) {
  ApiCall call("EnterCriticalSection", sim::kCannotFail);
  sim::World& world = call.world();
  sim::World::Lock lock = world.Acquire();
  sim::Kernel::Section& state = call.device().kernel().FindSection(section, "EnterCriticalSection");
  if (sim::TakeIfFree(state, call.thread())) return;
  const sim::PlaceInLine place(world, state, call.thread());
  world.WaitUntil(lock, {&state.left}, std::nullopt, [&] { return state.owner == &call.thread(); });
}

BOOL TryEnterCriticalSection(CRITICAL_SECTION* section) {
  ApiCall call("TryEnterCriticalSection", sim::kCannotFail);
  sim::World::Lock lock = call.world().Acquire();
  sim::Kernel& kernel = call.device().kernel();
  if (sim::TakeIfFree(kernel.FindSection(section, "TryEnterCriticalSection"), call.thread())) {
    return call.Return(TRUE);
  }
  call.world().Yield(lock);
  return call.Return(FALSE);
}

void LeaveCriticalSection(CRITICAL_SECTION* section) {
  ApiCall call("LeaveCriticalSection", sim::kCannotFail);
  const sim::World::Lock lock = call.world().Acquire();
  sim::Kernel::Section& state = call.device().kernel().FindSection(section, "LeaveCriticalSection");
  if (state.owner != &call.thread()) {
    std::fputs("cesim: LeaveCriticalSection by a thread that does not own the section\n", stderr);
    std::abort();
  }
  if (--state.depth == 0) sim::HandOver(call.world(), state);
}

void DeleteCriticalSection(CRITICAL_SECTION* section) {
  ApiCall call("DeleteCriticalSection", sim::kCannotFail);
  const sim::World::Lock lock = call.world().Acquire();
  sim::Kernel& kernel = call.device().kernel();
  static_cast<void>(kernel.FindSection(section, "DeleteCriticalSection"));
  kernel.RemoveSection(section);
}

}  // extern "C"
