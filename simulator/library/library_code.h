// Libraries that come from files of the device, and who reads such files.
#pragma once

#include <filesystem>
#include <functional>
#include <memory>
#include <string_view>

#include "ce/kernel.h"
#include "ce/types.h"

namespace sim {

/// A library's code in memory. Its end unloads it.
class LibraryCode {
 public:
  LibraryCode() = default;
  virtual ~LibraryCode() = default;
  LibraryCode(const LibraryCode&) = delete;
  LibraryCode& operator=(const LibraryCode&) = delete;

  /// Runs the entry point. The calling thread is one of the device's, which may call the device's
  /// API in it.
  /// @param reason  DLL_PROCESS_ATTACH behind the loading, DLL_PROCESS_DETACH before the end;
  ///   not given when the device ends first, as when a real one loses its power
  /// @return false when the library does not want to be loaded
  virtual bool Enter(HMODULE module, DWORD reason) = 0;
  /// @return the function of exactly that name, null when there is none
  [[nodiscard]] virtual FARPROC Find(std::u16string_view name) const = 0;
};

/// Makes code of a file.
/// @param file  an existing file, as the host calls it
/// @return null when it cannot; the reason stands on stderr, in one line
using LibraryReader =
    std::function<std::unique_ptr<LibraryCode>(const std::filesystem::path& file)>;

/// Who reads library files for all devices of this program; null, as at the start, for nobody. To
/// be called before a device loads one.
void SetLibraryReader(LibraryReader reader);
[[nodiscard]] const LibraryReader& GetLibraryReader();

}  // namespace sim
