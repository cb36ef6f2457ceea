#include "server/multicast/session_store.h"

#include <algorithm>
#include <array>
#include <fstream>
#include <iterator>
#include <sstream>
#include <system_error>

#include "base/crc32.h"
#include "mcftp/wire/frames.h"

namespace server {
namespace {

constexpr std::string_view kFirstLine = "orvenix multicast session 1";
constexpr std::array kStates = {DeviceState::kJoined, DeviceState::kProven, DeviceState::kDead,
                                DeviceState::kReleased};
constexpr std::array kPhases = {FilePhase::kAnnounced, FilePhase::kStreaming, FilePhase::kRepairing,
                                FilePhase::kClosing,   FilePhase::kLingering, FilePhase::kFinished};

/// FNV-1a: enough to tell one bundle from another by accident, and meant for nothing else.
class Hash {
 public:
  void Add(std::string_view text) {
    for (const char c : text) Byte(static_cast<unsigned char>(c));
    Byte(0);
  }
  void Add(std::uint64_t number) {
    for (unsigned shift = 0; shift < 64; shift += 8) {
      Byte(static_cast<unsigned char>(number >> shift & 0xFFU));
    }
  }
  [[nodiscard]] std::uint64_t value() const { return value_; }

 private:
  void Byte(unsigned char byte) { value_ = (value_ ^ byte) * 0x100000001B3U; }
  std::uint64_t value_ = 0xCBF29CE484222325U;
};

/// A file that was made anew may have its old size and time stamp: what devices hold of it would be
/// mixed with what it is now.
std::uint32_t ContentCrc(FileContent& content) {
  base::Crc32 crc;
  std::vector<std::uint8_t> piece(65536);
  for (std::uint32_t at = 0; at < content.size();) {
    const auto some =
        std::min<std::uint32_t>(content.size() - at, static_cast<std::uint32_t>(piece.size()));
    if (!content.Read(at, some, piece.data())) break;
    crc.Update(piece.data(), some);
    at += some;
  }
  return crc.value();
}

template <typename Value, typename List, typename Name>
std::optional<Value> Named(const List& values, Name name, std::string_view word) {
  for (const Value value : values) {
    if (name(value) == word) return value;
  }
  return std::nullopt;
}

bool ReadFile(std::istringstream& words, RunMemory& memory) {
  FileMemory file;
  std::string phase;
  if (!(words >> file.index >> file.transfer_id >> phase >> file.first_unsent >> file.last_sent)) {
    return false;
  }
  const auto known = Named<FilePhase>(kPhases, PhaseName, phase);
  if (!known || file.first_unsent == 0 || file.first_unsent > mcftp::kMaxBlocks + 1) return false;
  file.phase = *known;
  memory.files.push_back(std::move(file));
  return true;
}

bool ReadDevice(std::istringstream& words, RunMemory& memory) {
  DeviceMemory device;
  std::string peer;
  std::string state;
  if (memory.files.empty() || !(words >> peer >> state >> device.whole)) return false;
  const auto known_peer = ParsePeer(peer);
  const auto known_state = Named<DeviceState>(kStates, StateName, state);
  if (!known_peer || !known_state) return false;
  device.peer = *known_peer;
  device.state = *known_state;
  memory.files.back().devices.push_back(device);
  return true;
}

bool ReadLine(const std::string& line, RunMemory& memory) {
  std::istringstream words(line);
  std::string kind;
  words >> kind;
  if (kind == "run")
    return static_cast<bool>(words >> memory.fingerprint >> memory.round >> memory.port);
  if (kind == "file") return ReadFile(words, memory);
  if (kind == "device") return ReadDevice(words, memory);
  return false;
}

}  // namespace

std::uint64_t Fingerprint(const MulticastOptions& options,
                          const std::vector<MulticastFile>& files) {
  Hash hash;
  hash.Add(options.block_size);
  for (const MulticastFile& file : files) {
    hash.Add(file.device_path);
    hash.Add(file.masks);
    hash.Add(file.time_stamp);
    hash.Add(file.attributes);
    hash.Add(file.content->size());
    hash.Add(ContentCrc(*file.content));
  }
  return hash.value();
}

std::string ToText(const RunMemory& memory) {
  std::ostringstream text;
  text << kFirstLine << "\nrun " << memory.fingerprint << ' ' << memory.round << ' ' << memory.port
       << '\n';
  for (const FileMemory& file : memory.files) {
    text << "file " << file.index << ' ' << file.transfer_id << ' ' << PhaseName(file.phase) << ' '
         << file.first_unsent << ' ' << file.last_sent << '\n';
    for (const DeviceMemory& device : file.devices) {
      text << "device " << ToText(device.peer) << ' ' << StateName(device.state) << ' '
           << device.whole << '\n';
    }
  }
  text << "end\n";
  return text.str();
}

std::optional<RunMemory> ParseRunMemory(std::string_view text) {
  std::istringstream lines{std::string(text)};
  std::string line;
  if (!std::getline(lines, line) || line != kFirstLine) return std::nullopt;
  RunMemory memory;
  while (std::getline(lines, line)) {
    if (line == "end") return memory;  // written to its end
    if (!ReadLine(line, memory)) return std::nullopt;
  }
  return std::nullopt;
}

bool Store(const std::filesystem::path& path, const RunMemory& memory) {
  std::filesystem::path draft = path;
  draft += ".new";
  {
    std::ofstream file(draft, std::ios::binary | std::ios::trunc);
    file << ToText(memory);
    if (!file.flush()) return false;
  }
  std::error_code error;
  std::filesystem::rename(draft, path, error);
  return !error;
}

std::optional<RunMemory> Recall(const std::filesystem::path& path) {
  std::ifstream file(path, std::ios::binary);
  if (!file) return std::nullopt;
  return ParseRunMemory(
      std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()));
}

}  // namespace server
