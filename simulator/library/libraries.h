// The libraries that a device's programs load at run time, by name or from a file.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "ce/kernel.h"
#include "ce/types.h"
#include "library/library_code.h"

namespace sim {

class Device;

/// One library that the simulator itself supplies: what its file would hold.
struct Library {
  std::u16string name;  ///< without folder and ".dll"; its case does not count
  std::map<std::u16string, FARPROC, std::less<>> entries;  ///< by name, whose case counts
};

/// A device begins without any; the parts that bring one install it, and what lies in its storage
/// is read by whoever SetLibraryReader names. May be used by any thread; no lock is held while code
/// of a library runs.
class Libraries {
 public:
  explicit Libraries(Device& device) : device_(device) {}

  /// Puts a library onto the device, in place of one of the same name. One that is loaded already
  /// stays as it was.
  void Install(Library library);
  /// Takes it off the device; unknown names are passed over.
  void Remove(std::u16string_view name);

  /// Loads a library, or counts a further use of a loaded one. Alone, its name is looked for among
  /// the installed ones, in "\Windows" and in the root; ".dll" may be left out.
  /// @param error  what stood in the way; unchanged otherwise
  /// @return a number that fits 32 bits, the same for the same library; null when there is none
  HMODULE Load(std::u16string_view name, DWORD& error);
  /// Gives a use back. The last one unloads a library that came from a file.
  /// @return false when there is no such module
  bool Free(HMODULE module);
  /// @param error  why there is none; unchanged otherwise
  /// @return the function of that exact name, null when there is none
  [[nodiscard]] FARPROC Find(HMODULE module, std::u16string_view name, DWORD& error) const;
  /// The names of the libraries that have been loaded, in that order.
  [[nodiscard]] std::vector<std::u16string> Loaded() const;

 private:
  struct Module {
    std::u16string name;
    std::u16string key;
    std::shared_ptr<const Library> installed;  ///< exactly one of the two
    std::shared_ptr<LibraryCode> code;
    std::uint32_t uses = 1;  ///< 0: unloaded
  };

  static HMODULE NumberOf(std::size_t index);
  // With the lock held:
  [[nodiscard]] const Module* At(HMODULE module) const;
  HMODULE UseAgain(std::u16string_view key);
  HMODULE Add(Module module);

  HMODULE LoadFile(std::u16string_view name, const std::u16string& key, DWORD& error);
  void Drop(HMODULE module);

  Device& device_;
  mutable std::mutex mutex_;
  std::map<std::u16string, std::shared_ptr<const Library>> installed_;  ///< by folded name
  std::vector<Module> loaded_;
};

}  // namespace sim
