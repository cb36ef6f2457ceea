// A device's handles: numbers that fit 32 bits and are never used twice.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include "ce/types.h"
#include "world/world.h"

namespace sim {

/// What a handle stands for. Guarded by the world's lock.
class KernelObject {
 public:
  virtual ~KernelObject() = default;
  /// True when a wait on the object by `thread` would end now. Objects that nobody can wait on stay
  /// false.
  [[nodiscard]] virtual bool Signalled(const SimThread& thread) const;
  /// What a satisfied wait takes from the object (auto-reset event, semaphore count, ownership).
  virtual void Take(SimThread& thread);
  [[nodiscard]] virtual bool waitable() const { return false; }

  /// Notified whenever Signalled may have become true.
  WaitQueue queue;
};

class HandleTable {
 public:
  /// Lock held for all of these.
  HANDLE Add(std::shared_ptr<KernelObject> object);
  [[nodiscard]] std::shared_ptr<KernelObject> Find(HANDLE handle) const;
  template <typename T>
  [[nodiscard]] std::shared_ptr<T> FindAs(HANDLE handle) const {
    return std::dynamic_pointer_cast<T>(Find(handle));
  }
  /// @return the object that the handle stood for, null for an unknown handle.
  std::shared_ptr<KernelObject> Remove(HANDLE handle);
  [[nodiscard]] std::size_t open_handles() const { return objects_.size(); }

 private:
  std::map<std::uint32_t, std::shared_ptr<KernelObject>> objects_;
  std::uint32_t next_ = 0x10;
};

}  // namespace sim
