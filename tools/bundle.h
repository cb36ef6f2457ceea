// Bundles: a folder of files made ready for the upgrade server and for devices.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/bundle_firmware.h"
#include "tools/multicast_setup.h"

namespace tools {

/// What a bundle is made from and for.
struct BundleOptions {
  std::filesystem::path folder;  ///< the files; sub-folders included
  std::filesystem::path out;     ///< the bundle; an earlier bundle there is replaced

  std::string name = "bundle";        ///< first segment of every published path
  std::string address = "127.0.0.1";  ///< the server, as devices reach it
  std::uint16_t port = 8080;
  std::string destination = "\\Application";  ///< folder on the device
  std::string masks = "*";                    ///< device patterns, divided by blanks or semicolons
  bool show_window = true;
  std::string begin_text;
  std::string end_text;
  std::string syslog_address;  ///< empty: the device logs to its own file
  std::uint16_t syslog_port = 514;
  /// Attributes by file name pattern, for example {"*.ini", "hidden"}; the first that matches.
  std::vector<std::pair<std::string, std::string>> attributes;
  /// Device patterns by file name pattern, instead of `masks`; the first that matches.
  std::vector<std::pair<std::string, std::string>> file_masks;

  std::optional<MulticastSetup> multicast;  ///< none: every file goes by HTTP
  std::vector<std::string> http_only;       ///< name patterns of files that no group gets

  /// Other places by file name pattern, for the file itself without its sub-folders: a folder, or
  /// "RAM:" for the flash store; the first that matches.
  std::vector<std::pair<std::string, std::string>> destinations;
  std::string program;     ///< started on the device at the end; empty: none
  std::string parameters;  ///< its command line
  bool wait = true;        ///< the device waits for its end

  bool configuration = false;  ///< a configuration file also without firmware and INF file
  std::vector<FirmwareOptions> firmware;
  std::filesystem::path inf;  ///< an INF file, with what it names beside it; empty: none
};

/// One file of a bundle, as the list file, the server and the device know it.
struct BundleFile {
  std::string source;       ///< path on the server, below the served folder
  std::string destination;  ///< path on the device
  std::string masks;
  std::uint32_t crc32 = 0;
  std::uint64_t size = 0;
  std::uint32_t attributes = 0;  ///< 0: the server's usual ones
  bool by_multicast = false;     ///< announced to the group; HTTP repairs what is lost
};

struct Bundle {
  std::string name;
  std::string address;
  std::uint16_t port = 0;
  BundleFile list;  ///< the list file itself
  std::vector<BundleFile> files;
  std::uint64_t total_size = 0;  ///< of the files, without the list
  std::optional<MulticastSetup> multicast;
  /// What the configuration file brings besides; none: there is no such file.
  std::optional<std::size_t> configured_files;
};

/// The names inside a bundle's folder.
inline constexpr const char* kBundleManifest = "bundle.json";
inline constexpr const char* kBundleTree = "tree";
inline constexpr const char* kBundleJob = "job.xml";
inline constexpr const char* kBundleConfiguration = "upgrade.xml";

/// Makes a bundle: <out>/tree is what a server serves, <out>/job.xml what a host sends to devices,
/// <out>/bundle.json what this program reads again. With firmware or an INF file there is also
/// <out>/upgrade.xml, the configuration file; without files in the folder only that. The same
/// folder and options give the same bundle, byte for byte; files keep their times.
///
/// Throws Failure kBadInput for what devices could not take (names, lengths, sizes), before
/// anything is written, and kCannotWrite. An earlier bundle at `out` is only replaced by a complete
/// one.
Bundle MakeBundle(const BundleOptions& options);

/// Reads <folder>/bundle.json. Throws Failure kBadInput.
[[nodiscard]] Bundle ReadBundle(const std::filesystem::path& folder);

/// The list file: one line a file, "source,destination,masks,CRC,size".
[[nodiscard]] std::string FormatListFile(const Bundle& bundle);

/// The CRC that a list file gives for `file`. In a list, 0 means that the file is never looked at;
/// a file whose CRC is 0, as that of every empty file is, gets 1 instead. No check can succeed then
/// and the file is fetched in every run, where the server's own CRC decides.
[[nodiscard]] std::uint32_t ListedCrc(const BundleFile& file);

/// The files that go to the group. Folders come before what lies in them: a device makes the last
/// folder of a path, but none above it. The list file comes last, because every device can make it:
/// one that cannot make the last file of a run waits 300 s for another one.
[[nodiscard]] std::vector<BundleFile> AnnouncedFiles(const Bundle& bundle);

/// The job that makes a device fetch and check the bundle.
[[nodiscard]] std::string FormatBundleJob(const Bundle& bundle, const BundleOptions& options);

/// Reads "read-only,hidden,system,archive" into a mask. Throws Failure kUsage.
[[nodiscard]] std::uint32_t ParseAttributes(const std::string& names);

}  // namespace tools
