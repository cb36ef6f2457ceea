// The device's binary as a library of the simulated device.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string_view>
#include <vector>

#include "library/library_code.h"
#include "loader/gates.h"
#include "loader/mapped_image.h"
#include "tools/elf2pe/pe_reader.h"

namespace loader {

/// A DLL for Windows CE, loaded. Its functions are called like any others; with
/// Options::misaligned they are gates, and so are the functions of the host that are handed to
/// IcfgSetCallbacks.
class Dll final : public sim::LibraryCode {
 public:
  /// @throws elf2pe::Refusal, with one line that says why, for a file that is no such DLL or cannot
  ///   be placed
  explicit Dll(const std::filesystem::path& file, const Options& options = {});

  bool Enter(HMODULE module, DWORD reason) override;
  [[nodiscard]] FARPROC Find(std::u16string_view name) const override;

  [[nodiscard]] const MappedImage& image() const { return *image_; }
  /// By the bytes of their names.
  [[nodiscard]] const std::vector<elf2pe::PeExport>& exports() const { return exports_; }

 private:
  /// What the host calls in place of the function at `rva`.
  [[nodiscard]] Function Way(std::uint32_t rva) const;

  std::vector<elf2pe::PeExport> exports_;
  std::unique_ptr<MappedImage> image_;
  std::uint32_t entry_ = 0;
  bool misaligned_ = false;
};

/// The bytes of a DLL's file. @throws elf2pe::Refusal when it cannot be read or is far too large.
[[nodiscard]] std::string ReadDllFile(const std::filesystem::path& file);

/// Loads DLL files for sim::SetLibraryReader: with these options, or those of the environment. A
/// file that is refused leaves its line on stderr.
[[nodiscard]] sim::LibraryReader DllReader(const Options& options = OptionsFromEnvironment());

}  // namespace loader
