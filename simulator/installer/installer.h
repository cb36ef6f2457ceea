// The package installer of a device, "wceload.exe".
//
// Every device has it, unless its profile names a program of that name. It unpacks the cabinet with
// the host's cabextract, writes its files into the device's storage and its values into the
// registry, and notes in `programs.log` what it did. It has no window and asks nobody: where a
// device's installer would ask its user, it gives up.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

#include "installer/setup_file.h"

namespace sim {

class Device;

class Installer {
 public:
  /// Exit codes.
  static constexpr std::uint32_t kInstalled = 0;
  static constexpr std::uint32_t kNoPackage = 1;    ///< it is not there, or no package
  static constexpr std::uint32_t kWouldAsk = 2;     ///< installed already, or a file is protected
  static constexpr std::uint32_t kCannotWrite = 3;  ///< what was written before stays

  /// The program's name in small letters.
  static constexpr std::u16string_view kProgram = u"wceload.exe";
  /// How long it runs, in the device's time.
  static constexpr std::uint32_t kRunMs = 3000;

  explicit Installer(Device& device) : device_(device) {}

  /// Installs the package that a command line names: "/noui \Temp\scan.cab". Options begin with
  /// "/" and change nothing; the path may be in quotes. Blocks as long as the host takes, without
  /// the world's lock. @return the exit code.
  std::uint32_t Run(std::string_view command_line);

 private:
  std::uint32_t Install(const std::string& package);
  bool Unpack(const std::string& package);
  bool ReadSetup(PackageSetup& setup);
  bool WouldAsk(const PackageSetup& setup);
  bool WriteFiles(const PackageSetup& setup);
  bool WriteFile(const PackageFile& file);
  bool WriteValues(const PackageSetup& setup, const std::string& package);
  bool WriteValue(const PackageValue& value);
  /// The unpacked file with this number; empty when the cabinet has none.
  [[nodiscard]] std::filesystem::path Unpacked(std::uint16_t id) const;
  void Note(const std::string& what) const;

  Device& device_;
  std::filesystem::path folder_;  ///< of the host, while a package is unpacked
};

}  // namespace sim
