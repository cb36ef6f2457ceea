// What a job says about files, and what the server has of them; shared by the checks of lists and
// of firmware.
#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/lint/checks.h"

namespace server {
class SiteFile;
}

namespace tools {

/// The whole of a served file.
[[nodiscard]] std::string ReadServed(const server::SiteFile& file);

/// One file to fetch, from the job, from a line of its list file, or of a package.
struct WantedFile {
  std::string where;
  std::string_view source;
  std::string_view destination;
  std::string_view masks;
  std::string_view crc;
  std::string_view size;  ///< of list files only
};

class FilesCheck {
 public:
  /// @param site  the served folder, or null
  FilesCheck(const JobCheck& check, server::Site* site);

  void Downloads();
  void List();
  void Unlisted();
  void Multicast();
  void Packages();
  void Inf();

 private:
  void Add(Rule rule, const std::string& where, std::string found) {
    check_.findings.Add(rule, where, std::move(found));
  }
  std::string InJob(int line) const { return check_.name + ":" + std::to_string(line); }

  /// A source as the server sees it: slashes, and none in front.
  static std::string PathOnServer(std::string_view source);

  // ---- files of the job and of its list: check_files.cpp ----
  void Wanted(const WantedFile& file);
  void Source(const WantedFile& file);
  void Destination(const WantedFile& file);
  void Twice(const WantedFile& file);
  void Crc(const WantedFile& file);
  void Served(const WantedFile& file);
  void ServedList(const std::string& text);
  bool Record(std::string_view line, const std::string& where);
  void Sizes();
  void Folders();

  // ---- firmware: check_firmware.cpp ----
  void Package(const PackageSettings& package);
  void PackageFiles(const PackageSettings& package);
  void Options(const PackageSettings& package);
  void Passes();
  void RamSizes();
  void InfEntries(std::string_view text, const std::string& path);

  const JobCheck& check_;
  server::Site* const site_;
  /// By the destination's key: where it came from, for which devices.
  std::map<std::string, std::pair<std::string, std::string>> destinations_;
  std::set<std::string> asked_;  ///< paths on the server
  std::set<std::string> masks_;
  std::vector<std::string> listed_;  ///< destinations of the list
  std::uint64_t listed_bytes_ = 0;
  bool sizes_known_ = true;
  bool has_ram_ = false;  ///< a requirement gives the RAM buffer its size
};

}  // namespace tools
