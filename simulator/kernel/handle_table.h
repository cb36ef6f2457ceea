// A device's handles: numbers that fit 32 bits and are never used twice.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "ce/types.h"
#include "world/world.h"

namespace sim {

class ObjectWait;

/// What a handle stands for. Guarded by the world's lock, which is held, too, when the last
/// reference goes: a destructor must not take it.
class KernelObject {
 public:
  virtual ~KernelObject() = default;
  /// True when a wait on the object by `thread` would end now. Objects that nobody can wait on stay
  /// false.
  [[nodiscard]] virtual bool Signalled(const SimThread& thread) const;
  /// What a satisfied wait takes from the object (auto-reset event, semaphore count, ownership).
  /// @return true when the object had been abandoned by its last owner.
  virtual bool Take(SimThread& thread);
  [[nodiscard]] virtual bool can_be_awaited() const { return false; }
  /// Notify this queue when Signalled may have become true: every waiter looks for itself.
  [[nodiscard]] virtual WaitQueue& wait_queue() { return queue; }
  /// The stricter way: ends the waits that the object can end now, oldest first, and takes from the
  /// object what they take. A thread that arrives later cannot slip in before them.
  void Offer();

  WaitQueue queue;

 private:
  friend class ObjectWait;
  std::vector<ObjectWait*> waits_;  ///< oldest first
};

/// One thread's wait for handles, from its beginning to its end. Lock held throughout.
class ObjectWait {
 public:
  using Objects = std::vector<std::shared_ptr<KernelObject>>;
  ObjectWait(SimThread& thread, Objects objects, bool all);
  ~ObjectWait();
  ObjectWait(const ObjectWait&) = delete;
  ObjectWait& operator=(const ObjectWait&) = delete;

  /// Waits until one object (or all) is had, or `deadline` passes; none: no limit.
  /// @return what WaitForMultipleObjects returns.
  std::uint32_t Run(World& world, World::Lock& lock, std::optional<Micros> deadline);

 private:
  friend class KernelObject;
  /// Takes what the wait is for, if it is there. @return true once the wait is over.
  bool TrySatisfy();
  [[nodiscard]] bool TakeAll();
  [[nodiscard]] bool TakeFirst();

  SimThread& thread_;
  const Objects objects_;
  const bool all_;
  std::optional<std::uint32_t> result_;
  WaitQueue satisfied_;
};

/// Lock held for all of these.
class HandleTable {
 public:
  HANDLE Add(std::shared_ptr<KernelObject> object);
  [[nodiscard]] std::shared_ptr<KernelObject> Find(HANDLE handle) const;
  template <typename T>
  [[nodiscard]] std::shared_ptr<T> FindAs(HANDLE handle) const {
    return std::dynamic_pointer_cast<T>(Find(handle));
  }
  /// @return the object that the handle stood for, null for an unknown handle.
  std::shared_ptr<KernelObject> Remove(HANDLE handle);
  /// Removes everything, in the order in which the handles were made.
  void Clear();
  [[nodiscard]] std::size_t open_handles() const { return objects_.size(); }

 private:
  std::map<std::uint32_t, std::shared_ptr<KernelObject>> objects_;
  std::uint32_t next_ = 0x10;
};

}  // namespace sim
