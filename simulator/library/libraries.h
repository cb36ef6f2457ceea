// The libraries that a device's programs load at run time, by name.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "ce/kernel.h"
#include "ce/types.h"

namespace sim {

/// One library: what its file would hold.
struct Library {
  std::u16string name;  ///< without folder and ".dll"; its case does not count
  std::map<std::u16string, FARPROC, std::less<>> entries;  ///< by name, whose case counts
};

/// A device begins without any; the parts that bring one install it. May be used by any thread;
/// takes no lock but its own.
class Libraries {
 public:
  /// Puts a library onto the device, in place of one of the same name. One that is loaded already
  /// stays as it was.
  void Install(Library library);
  /// Takes it off the device; unknown names are passed over.
  void Remove(std::u16string_view name);

  /// @param name  as programs give it: alone or in "\Windows", with ".dll" or without
  /// @return a number that fits 32 bits, the same for the same library; null when there is none
  HMODULE Load(std::u16string_view name);
  /// @return the library behind `module`, null when there is none
  [[nodiscard]] std::shared_ptr<const Library> Find(HMODULE module) const;
  /// The names of the libraries that have been loaded, in that order.
  [[nodiscard]] std::vector<std::u16string> Loaded() const;

 private:
  mutable std::mutex mutex_;
  std::map<std::u16string, std::shared_ptr<const Library>> installed_;  ///< by folded name
  std::vector<std::shared_ptr<const Library>> loaded_;
};

}  // namespace sim
