// What the management client does on every target, and what the server has for it.
#pragma once

#include <filesystem>
#include <map>
#include <string>
#include <vector>

#include "server/multicast_file.h"

namespace targets {

/// A file that is sent to a group.
struct SentFile {
  std::string device_path;
  std::string masks;  ///< empty: for all
  std::string content;
};

struct Scenario {
  std::string name;                         ///< also that of its walk, walks/<name>.walk
  std::map<std::string, std::string> site;  ///< what HTTP serves: content by path
  std::vector<SentFile> sent;               ///< in this order; empty: nothing goes to a group
};

/// All scenarios, in the order in which they are worth running: the longest first.
[[nodiscard]] const std::vector<Scenario>& Scenarios();

/// The text of a scenario's walk. "{crc files/a.bin}" in it becomes the CRC-32 of what HTTP serves
/// under that path, as jobs write it, "{size files/a.bin}" its size.
/// Throws std::runtime_error for a file that is not served.
[[nodiscard]] std::string WalkOf(const Scenario& scenario, const std::filesystem::path& walks);

}  // namespace targets
