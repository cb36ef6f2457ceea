// What a server that is started again wants to know of the run before.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "server/multicast_figures.h"
#include "server/multicast_file.h"
#include "server/multicast_options.h"
#include "server/peer.h"

namespace server {

struct DeviceMemory {
  Peer peer;
  DeviceState state = DeviceState::kJoined;
  bool whole = false;  ///< it has all but the blocks held back
};

struct FileMemory {
  std::uint32_t index = 0;  ///< in the list of files
  std::uint32_t transfer_id = 0;
  FilePhase phase = FilePhase::kAnnounced;
  std::uint32_t first_unsent = 1;  ///< every block below it has gone out
  bool last_sent = false;          ///< and the last one too
  std::vector<DeviceMemory> devices;
};

struct RunMemory {
  std::uint64_t fingerprint = 0;  ///< of the files and of how they are cut into blocks
  std::uint32_t round = 1;
  std::uint16_t port = 0;         ///< of the server's socket
  std::vector<FileMemory> files;  ///< of the run so far; all but the last are finished
};

[[nodiscard]] std::uint64_t Fingerprint(const MulticastOptions& options,
                                        const std::vector<MulticastFile>& files);

/// Lines of words. Read back, any other text is nothing.
[[nodiscard]] std::string ToText(const RunMemory& memory);
[[nodiscard]] std::optional<RunMemory> ParseRunMemory(std::string_view text);

/// Replaces the file in one step. @return false when the disk does not want it
[[nodiscard]] bool Store(const std::filesystem::path& path, const RunMemory& memory);
/// Nothing when there is none, or none that can be read.
[[nodiscard]] std::optional<RunMemory> Recall(const std::filesystem::path& path);

}  // namespace server
