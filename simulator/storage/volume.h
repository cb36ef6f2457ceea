// One volume of a device: the root, or a card or flash disk that shows as a folder in the root.
#pragma once

#include <atomic>
#include <cstdint>
#include <string>

#include "memory/space.h"

namespace sim {

/// Room is counted in bytes of file content; names and folders cost nothing. Any thread.
class Volume {
 public:
  /// The root volume, whose room is the object store's.
  explicit Volume(Space& store) : space_(store) {}
  Volume(std::u16string volume_name, std::uint64_t capacity, bool is_present)
      : name_(std::move(volume_name)), own_(capacity), space_(own_), present_(is_present) {}
  Volume(const Volume&) = delete;
  Volume& operator=(const Volume&) = delete;

  /// Its folder's name in the root; empty for the root itself.
  [[nodiscard]] const std::u16string& name() const { return name_; }
  [[nodiscard]] bool is_root() const { return name_.empty(); }
  [[nodiscard]] Space& space() { return space_; }
  [[nodiscard]] bool present() const { return present_.load(std::memory_order_relaxed); }
  void set_present(bool present) { present_.store(present, std::memory_order_relaxed); }

 private:
  const std::u16string name_;
  Space own_;
  Space& space_;
  std::atomic<bool> present_{true};
};

}  // namespace sim
