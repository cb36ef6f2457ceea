#include "server/multicast/session_store.h"

#include <algorithm>
#include <array>
#include <fstream>
#include <iterator>
#include <map>
#include <sstream>
#include <system_error>
#include <utility>

#include "base/crc32.h"
#include "mcftp/wire/frames.h"
#include "server/multicast/transfer.h"

namespace server {
namespace {

constexpr std::string_view kFirstLine = "orvenix multicast session 2";
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

/// Reads the lines of a session file one after the other.
class Reader {
 public:
  /// @return false for a line that no session file has.
  bool Take(const std::string& line);
  [[nodiscard]] RunMemory&& memory() { return std::move(memory_); }

 private:
  bool TakeFile(std::istringstream& words);
  bool TakeDevice(std::istringstream& words);

  RunMemory memory_;
  std::map<Peer, std::size_t> places_;  ///< of the last file's devices
};

bool Reader::TakeFile(std::istringstream& words) {
  FileMemory file;
  std::string phase;
  SentFrames& sent = file.sent;
  if (!(words >> file.index >> file.transfer_id >> phase >> file.first_unsent >> file.last_sent >>
        sent.first_pass_frames >> sent.repair_frames >> sent.farewell_frames >>
        sent.control_frames >> sent.frames >> sent.wire_bytes)) {
    return false;
  }
  const auto known = Named<FilePhase>(kPhases, PhaseName, phase);
  if (!known || file.first_unsent == 0 || file.first_unsent > mcftp::kMaxBlocks + 1) return false;
  file.phase = *known;
  if (!memory_.files.empty() && memory_.files.back().transfer_id == file.transfer_id) {
    file.devices = std::move(memory_.files.back().devices);
    memory_.files.back() = std::move(file);
  } else {
    memory_.files.push_back(std::move(file));
    places_.clear();
  }
  return true;
}

/// The texts stand behind the words, each after a tab.
bool Reader::TakeDevice(std::istringstream& words) {
  DeviceMemory device;
  std::string peer;
  std::string state;
  std::string none;
  if (memory_.files.empty() || !(words >> peer >> state >> device.whole >> device.late) ||
      !std::getline(words, none, '\t') || !std::getline(words, device.reason, '\t')) {
    return false;
  }
  std::getline(words, device.last_heard);
  const auto known_peer = ParsePeer(peer);
  const auto known_state = Named<DeviceState>(kStates, StateName, state);
  if (!known_peer || !known_state) return false;
  device.peer = *known_peer;
  device.state = *known_state;
  std::vector<DeviceMemory>& devices = memory_.files.back().devices;
  const auto [place, is_new] = places_.emplace(device.peer, devices.size());
  if (is_new) {
    devices.push_back(std::move(device));
  } else {
    devices[place->second] = std::move(device);
  }
  return true;
}

bool Reader::Take(const std::string& line) {
  std::istringstream words(line);
  std::string kind;
  words >> kind;
  if (kind == "run") {
    return static_cast<bool>(words >> memory_.fingerprint >> memory_.round >> memory_.port);
  }
  if (kind == "file") return TakeFile(words);
  if (kind == "device") return TakeDevice(words);
  return false;
}

/// All but the first line of a session file.
void WriteLines(std::ostream& text, const RunMemory& memory) {
  text << "run " << memory.fingerprint << ' ' << memory.round << ' ' << memory.port << '\n';
  for (const FileMemory& file : memory.files) {
    const SentFrames& sent = file.sent;
    text << "file " << file.index << ' ' << file.transfer_id << ' ' << PhaseName(file.phase) << ' '
         << file.first_unsent << ' ' << file.last_sent << ' ' << sent.first_pass_frames << ' '
         << sent.repair_frames << ' ' << sent.farewell_frames << ' ' << sent.control_frames << ' '
         << sent.frames << ' ' << sent.wire_bytes << '\n';
    for (const DeviceMemory& device : file.devices) {
      text << "device " << ToText(device.peer) << ' ' << StateName(device.state) << ' '
           << device.whole << ' ' << device.late << '\t' << device.reason << '\t'
           << device.last_heard << '\n';
    }
  }
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
  text << kFirstLine << '\n';
  WriteLines(text, memory);
  return text.str();
}

std::optional<RunMemory> ParseRunMemory(std::string_view text) {
  Reader reader;
  bool begun = false;
  for (std::size_t end = 0; (end = text.find('\n')) != std::string_view::npos;) {
    const std::string line(text.substr(0, end));
    text.remove_prefix(end + 1);
    if (begun ? !reader.Take(line) : line != kFirstLine) return std::nullopt;
    begun = true;
  }
  if (!begun) return std::nullopt;
  return reader.memory();
}

DeviceMemory RememberDevice(const Device& device) {
  const DeviceFigures& figures = device.figures;
  return {figures.peer, figures.state,  device.whole,
          figures.late, figures.reason, figures.last_heard};
}

FileMemory RememberFile(const FileFigures& figures) {
  FileMemory memory;
  memory.index = static_cast<std::uint32_t>(figures.index);
  memory.transfer_id = figures.transfer_id;
  memory.phase = figures.phase;
  memory.sent = figures;
  for (const DeviceFigures& device : figures.devices) {
    memory.devices.push_back(
        {device.peer, device.state, false, device.late, device.reason, device.last_heard});
  }
  return memory;
}

std::optional<RunMemory> Recall(const std::filesystem::path& path) {
  std::ifstream file(path, std::ios::binary);
  if (!file) return std::nullopt;
  return ParseRunMemory(
      std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()));
}

bool SessionJournal::Begin(const RunMemory& everything) {
  file_.close();
  std::filesystem::path draft = path_;
  draft += ".new";
  file_.open(draft, std::ios::binary | std::ios::trunc);
  file_ << ToText(everything);
  std::error_code error;
  if (file_.flush()) std::filesystem::rename(draft, path_, error);
  if (!file_ || error) file_.close();
  return file_.is_open();
}

bool SessionJournal::Add(const RunMemory& changes) {
  if (!file_.is_open()) return false;
  WriteLines(file_, changes);
  if (file_.flush()) return true;
  file_.close();
  return false;
}

void SessionJournal::Remove() {
  file_.close();
  std::error_code ignored;
  std::filesystem::remove(path_, ignored);
}

}  // namespace server
