// Waiting for a file that is for this device, and making room for it.
#include <coredll.h>

#include "base/text.h"
#include "device/flash/ram_file.h"
#include "mcftp/client.h"
#include "mcftp/rules/mask_compare.h"
#include "mcftp/rules/time_stamp.h"

namespace mcftp {
namespace {

constexpr std::uint32_t kAnnouncementWaitMs = 300000;
constexpr std::string_view kRamPrefix = "RAM:";

/// Up to and with the last backslash.
std::string_view DirectoryOf(std::string_view path) noexcept {
  const std::size_t end = path.rfind('\\');
  return end == std::string_view::npos ? std::string_view() : base::Part(path, 0, end + 1);
}

}  // namespace

Event McftpClient::AwaitAnnouncement() noexcept {
  if (file_is_ram_) file_.Reset();
  file_is_ram_ = false;
  Log("Waiting for a Multicast MCFTP Server to announce a file...");
  do {
    if (!ReceiveFrame(kAnnouncementWaitMs)) {
      Log("WRQ Timeout");
      return Event::EventShutdown;
    }
    if (frame_.header.Is(Opcode::kOptionAck)) AnswerForPreviousFile();
  } while (!frame_.header.Is(Opcode::kAnnouncement));
  const bool last_file = frame_.announcement.last_file;
  if (last_file) Log("Last file flag set");
  if (!IsForThisDevice()) return last_file ? Event::EventShutdown : Event::EventAbort;
  ReadAnnouncement();
  return AcceptFile();
}

/// The server has not heard the answer that ended the file before.
///
/// KEPT ODDITY: a client that waits for an announcement answers OACKs, though it has no session;
/// one that has had no file acknowledges block 0.
void McftpClient::AnswerForPreviousFile() noexcept {
  if (role_ == Role::kNakMaster) {
    Log("Resending NAK for block number %u (last)", static_cast<unsigned>(session_.block_count));
    static_cast<void>(SendNak());
  } else if (role_ == Role::kAckMaster) {
    Log("Resending ACK for block number %u (last)", static_cast<unsigned>(session_.block_count));
    static_cast<void>(SendAck(static_cast<std::uint16_t>(session_.block_count)));
  }
}

/// What a rejected announcement says is not taken on: until a file is accepted, the client answers
/// for the one before.
void McftpClient::ReadAnnouncement() noexcept {
  const Announcement& said = frame_.announcement;
  session_.last_file = said.last_file;
  session_.block_size = said.block_size;
  session_.file_size = said.file_size;
  session_.block_count = said.BlockCount();
  session_.oack_wait_ms = said.oack_wait_ms;
  session_.attributes = said.attributes;
  session_.transfer_id = said.transfer_id;
  session_.step_percent = said.step_percent;
  session_.step_kib = said.step_kib;
  const bool names_server = said.server_port != 0 && said.server_address != 0;
  session_.server_port = names_server ? said.server_port : std::uint16_t{0};
  session_.server_address = names_server ? said.server_address : 0;
  // KEPT ODDITY: a file without a time stamp gets that of the file before.
  if (said.time_stamp[0] != '\0') time_stamp_ = ParseTimeStamp(base::View(said.time_stamp));
}

bool McftpClient::IsForThisDevice() noexcept {
  std::string_view masks = frame_.announcement.masks;
  const std::string_view mct = options_.mct.view();
  if (masks.empty() || mct.empty()) return true;
  Log("Device MCT: %s", options_.mct.c_str());
  Log("MCT mask(s) in Announcement: %.*s", static_cast<int>(masks.size()), masks.data());
  while (true) {
    const std::string_view mask = NextMask(masks);
    if (mask.empty()) break;
    Log("MCT mask in Announcement: %.*s", static_cast<int>(mask.size()), mask.data());
    if (MaskMatches(mask, mct)) {
      Log("MCT and mask compare, receiving file");
      return true;
    }
  }
  Log("MCT and mask did NOT compare, NOT receiving file");
  return false;
}

/// KEPT ODDITY: when the file cannot be opened there is no reset: its name stays known, and further
/// announcements of it are not heard. The same holds when no request is answered.
Event McftpClient::AcceptFile() noexcept {
  file_name_.Assign(frame_.announcement.file_name);
  file_is_known_ = true;
  private_group_known_ = false;
  Log("Announcement on %s for:", options_.public_group.c_str());
  Log("%s", file_name_.c_str());
  const std::string_view masks = frame_.announcement.masks;
  Log("MCT mask(s): %.*s", static_cast<int>(masks.size()), masks.data());
  Log("Data blocks: %u", static_cast<unsigned>(session_.block_count));
  if (!MakeOutputFile() || !OpenOutputFile()) return Event::EventFileError;
  bitmap_.Clear();
  requests_sent_ = 0;
  error_received_ = false;
  return Event::EventAnnouncement;
}

const char* McftpClient::output_name() const noexcept {
  return file_name_.c_str() + (file_is_ram_ ? kRamPrefix.size() : 0);
}

/// The object that the file before was written through goes, and closes what is still open.
bool McftpClient::MakeOutputFile() noexcept {
  file_is_ram_ =
      base::EqualIgnoringCase(base::Part(file_name_.view(), 0, kRamPrefix.size()), kRamPrefix);
  file_.Reset();
  if (!file_is_ram_) {
    file_.Reset(new device::File);
  } else {
    Log("RAM image: %s", file_name_.c_str());
    file_.Reset(new device::RAMFile);
    // Whoever comes first makes the store. Without one the file cannot be opened.
    if (!device::HasRAMStore()) device::InitRAMStore();
  }
  return static_cast<bool>(file_);
}

bool McftpClient::OpenOutputFile() noexcept {
  LogAndStatus(StatusCode::kOpening);
  Log("Opening: %s (%u)", output_name(), static_cast<unsigned>(session_.file_size));
  if (file_->OpenForWriting(output_name(), false, session_.file_size)) return true;
  const std::string_view directory = DirectoryOf(file_name_.view());
  if (!file_is_ram_ && !directory.empty() && directory != "\\") {
    return OpenInNewDirectory(directory);
  }
  Log("Error opening: %s", output_name());
  return false;
}

/// KEPT ODDITY: the last folder of the path is made, and none above it.
bool McftpClient::OpenInNewDirectory(std::string_view directory) noexcept {
  const base::FixedText<kMaxFileName + 1> folder(base::Part(directory, 0, directory.size() - 1));
  if (!file_->CreateDirectory(folder.c_str())) {
    Log("Error creating: %.*s%s", static_cast<int>(directory.size()), directory.data(),
        file_name_.c_str() + directory.size());
    return false;
  }
  Log("Opening: %s", file_name_.c_str());
  if (file_->OpenForWriting(file_name_.c_str(), false, session_.file_size)) return true;
  Log("Error opening: %s", file_name_.c_str());
  return false;
}

}  // namespace mcftp
