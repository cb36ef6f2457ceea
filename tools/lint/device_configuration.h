// A configuration file as UpgradeConfig::LoadFromFile understands it, with its lines.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

#include "tools/lint/device_job.h"

namespace tools {

/// Reads `text` by the rules of the device: elements by their names wherever they stand, texts with
/// all their blanks, folders of packages completed by a backslash. What the reading itself shows
/// goes to `findings`; `name` stands for the file. Throws Failure kBadInput for what is no XML:
/// the device would take nothing of it.
[[nodiscard]] DeviceJob ReadConfiguration(std::string_view text, const std::string& name,
                                          Findings& findings);

/// Whether the file holds a configuration rather than a job: its root is no <DevInfo>.
[[nodiscard]] bool IsConfiguration(std::string_view text);

/// Packages that a device with this configuration text takes.
[[nodiscard]] std::vector<const PackageSettings*> PackagesFor(const DeviceJob& job,
                                                              const std::string& configuration);

/// Whether one of these packages names a pass, which makes the job one of several.
[[nodiscard]] bool IsMultiPass(const std::vector<const PackageSettings*>& packages);

/// The last pass that something is fetched in; 1 for a job of one pass.
[[nodiscard]] int LastPass(const std::vector<const PackageSettings*>& packages);

/// One file of a package: on the server and on the device.
struct PackageFile {
  std::string source;
  std::string destination;
};
/// In the order in which they are fetched, at most the first thousand.
[[nodiscard]] std::vector<PackageFile> FilesOf(const PackageSettings& package);

}  // namespace tools
