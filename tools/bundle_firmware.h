// What a bundle brings by its configuration file: firmware packages and INF files.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

namespace tools {

struct Bundle;
struct BundleOptions;

/// One firmware package, as it is asked for.
struct FirmwareOptions {
  /// One image; or the first of numbered parts, "os001.zip", beside which the others lie.
  std::filesystem::path file;
  std::string hardware = "*";        ///< patterns of configuration texts, divided by commas
  std::string flash;                 ///< empty: any
  std::string destination = "RAM:";  ///< or a folder on the device
  std::string command_line;          ///< for the program that is started at the end
  int pass = 0;                      ///< 1 to 9; 0: the job has one pass
  std::uint64_t ram = 0;             ///< bytes of the flash store; 0: what the pass needs
  std::string disk;                  ///< "FOLDER:BYTES"; empty: what it needs, if it goes to a card
};

/// Reads "FILE;hardware=TQ52*;to=RAM:;pass=1". Throws Failure kUsage.
[[nodiscard]] FirmwareOptions ParseFirmware(const std::string& text);

/// A file that the configuration brings, and where it is served.
struct ConfiguredFile {
  std::filesystem::path from;
  std::string source;  ///< below the served folder
  std::uint64_t size = 0;
};

/// A package as the configuration file has it.
struct FirmwarePlan {
  FirmwareOptions options;
  std::string folder;  ///< on the server
  std::string base;
  int count = 0;  ///< parts; 0: one file
  std::vector<ConfiguredFile> files;
  std::string parameters;  ///< AdditionalParms

  [[nodiscard]] bool is_for_ram() const { return count == 0 && options.destination == "RAM:"; }
  [[nodiscard]] std::uint64_t size() const;
};

struct ConfigurationPlan {
  bool wanted = false;  ///< the bundle gets a configuration file
  std::vector<FirmwarePlan> packages;
  std::string inf;                        ///< on the server; empty: none
  std::vector<ConfiguredFile> inf_files;  ///< the INF file and what it names

  /// Everything, in the order of the packages.
  [[nodiscard]] std::vector<ConfiguredFile> Files() const;
};

/// Finds the files of packages and INF, and refuses what devices could not take. Files of `bundle`
/// that go to "RAM:" become packages too: only those are flashed. Throws Failure kBadInput and
/// kUsage.
[[nodiscard]] ConfigurationPlan PlanConfiguration(const Bundle& bundle,
                                                  const BundleOptions& options);

/// The configuration file.
[[nodiscard]] std::string FormatConfiguration(const Bundle& bundle, const BundleOptions& options,
                                              const ConfigurationPlan& plan);

}  // namespace tools
