#include "kernel/handle_table.h"

#include <utility>

namespace sim {
namespace {

// Handles look as on the device: multiples of four, never 0 or -1.
constexpr std::uint32_t kStep = 4;

}  // namespace

bool KernelObject::Signalled(const SimThread& /*thread*/) const {
  return false;
}

bool KernelObject::Take(SimThread& /*thread*/) {
  return false;
}

HANDLE HandleTable::Add(std::shared_ptr<KernelObject> object) {
  next_ += kStep;
  objects_.emplace(next_, std::move(object));
  return reinterpret_cast<HANDLE>(static_cast<std::uintptr_t>(next_));
}

std::shared_ptr<KernelObject> HandleTable::Find(HANDLE handle) const {
  const auto number = reinterpret_cast<std::uintptr_t>(handle);
  if (number > next_) return nullptr;
  const auto found = objects_.find(static_cast<std::uint32_t>(number));
  return found != objects_.end() ? found->second : nullptr;
}

std::shared_ptr<KernelObject> HandleTable::Remove(HANDLE handle) {
  std::shared_ptr<KernelObject> object = Find(handle);
  if (object != nullptr) {
    objects_.erase(static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(handle)));
  }
  return object;
}

void HandleTable::Clear() {
  while (!objects_.empty()) {
    // Out of the table first: an object may remove handles of its own when it goes.
    const std::shared_ptr<KernelObject> object = std::move(objects_.begin()->second);
    objects_.erase(objects_.begin());
  }
}

}  // namespace sim
