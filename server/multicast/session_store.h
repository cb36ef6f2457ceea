// What a server that is started again wants to know of the run before.
#pragma once

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "server/multicast_figures.h"
#include "server/multicast_file.h"
#include "server/multicast_options.h"
#include "server/peer.h"

namespace server {

struct Device;

struct DeviceMemory {
  Peer peer;
  DeviceState state = DeviceState::kJoined;
  bool whole = false;  ///< it has all but the blocks held back
  bool late = false;
  std::string reason;
  std::string last_heard;
};

struct FileMemory {
  std::uint32_t index = 0;  ///< in the list of files
  std::uint32_t transfer_id = 0;
  FilePhase phase = FilePhase::kAnnounced;
  std::uint32_t first_unsent = 1;  ///< every block below it has gone out
  bool last_sent = false;          ///< and the last one too
  SentFrames sent;
  std::vector<DeviceMemory> devices;
};

struct RunMemory {
  std::uint64_t fingerprint = 0;  ///< of the files and of how they are cut into blocks
  std::uint32_t round = 1;
  std::uint16_t port = 0;         ///< of the server's socket
  std::vector<FileMemory> files;  ///< of the run so far; all but the last are finished
};

[[nodiscard]] DeviceMemory RememberDevice(const Device& device);
/// A finished file, with its devices.
[[nodiscard]] FileMemory RememberFile(const FileFigures& figures);

[[nodiscard]] std::uint64_t Fingerprint(const MulticastOptions& options,
                                        const std::vector<MulticastFile>& files);

/// Lines of words. A line that comes later and speaks of the same file or device takes the place of
/// the one before. Read back, a text whose last line was cut is as if that line had not been
/// written; any other text is nothing.
[[nodiscard]] std::string ToText(const RunMemory& memory);
[[nodiscard]] std::optional<RunMemory> ParseRunMemory(std::string_view text);

/// Nothing when there is no such file, or none that can be read.
[[nodiscard]] std::optional<RunMemory> Recall(const std::filesystem::path& path);

/// The session file while its run goes on: what changes is added at its end, so that a device that
/// joins costs one line, however many others and files there are.
class SessionJournal {
 public:
  /// Empty: nothing is kept.
  explicit SessionJournal(std::filesystem::path path) : path_(std::move(path)) {}

  [[nodiscard]] bool keeps() const { return !path_.empty(); }
  /// Puts a file with everything in the place of the one that is there, in one step.
  /// @return false when the disk does not want it
  [[nodiscard]] bool Begin(const RunMemory& everything);
  /// @param changes  the run's numbers and one file, with the devices that are other than before
  /// @return false when it could not be added, and Begin is needed
  [[nodiscard]] bool Add(const RunMemory& changes);
  void Remove();

 private:
  const std::filesystem::path path_;
  std::ofstream file_;
};

}  // namespace server
