// The multicast file transfer client.
#pragma once

#include <coredll.h>

#include <cstdint>

#include "base/text.h"
#include "device/critical_section.h"
#include "device/file.h"
#include "device/handle.h"
#include "device/local_memory.h"
#include "mcftp/frame_link.h"
#include "mcftp/owner.h"
#include "mcftp/rules/block_bitmap.h"
#include "mcftp/rules/command_line.h"
#include "mcftp/rules/overrun.h"
#include "mcftp/rules/state_table.h"
#include "mcftp/rules/time_stamp.h"
#include "mcftp/settings.h"
#include "mcftp/udp_socket/udp_socket.h"
#include "mcftp/wire/frames.h"

namespace mcftp {

/// What the client has received since it started; never reset.
struct RunCounters {
  std::uint32_t files_received = 0;   ///< of the right size
  std::uint32_t size_mismatches = 0;  ///< files that are not
  std::uint32_t total_bytes = 0;      ///< written, over all files
};

/// What the last announcement said, but for the texts that the client keeps elsewhere.
struct Session {
  bool last_file = false;
  std::uint16_t block_size = 0;  ///< bytes
  std::uint32_t file_size = 0;   ///< bytes
  std::uint32_t block_count = 0;
  std::uint32_t oack_wait_ms = 0;  ///< 0 waits without limit
  std::uint32_t attributes = 0;
  std::uint32_t transfer_id = 0;
  std::uint8_t step_percent = 0;
  std::uint16_t step_kib = 0;
  /// KEPT ODDITY: kept, and never used: frames go to whoever sent the last one that was no DATA.
  std::uint16_t server_port = 0;
  std::uint32_t server_address = 0;
};

/// What is counted for one file and begins anew with the next. Some of it is only kept.
struct FileProgress {
  std::uint32_t bytes = 0;               ///< written
  std::uint32_t bytes_since_report = 0;  ///< to the user interfaces
  std::uint32_t blocks = 0;              ///< written
  std::uint32_t retries = 0;             ///< read requests beyond the first
  std::uint16_t last_written = 0;        ///< block
  std::uint16_t last_acked = 0;          ///< block
  std::uint16_t last_naked = 0;          ///< block
  float reported_percent = 0;
};

/// Receives the files that a server announces on a multicast group, one after the other, on a
/// thread of its own: waits for an announcement, asks for the file, joins its group, writes its
/// blocks, answers as the server has told it to, dallies, and begins again.
///
/// All its state is in the object; any number of clients can live in one process. It is about 20
/// KiB large and takes 70 more for cipher and receive buffer, whatever the size of the files; it
/// allocates nothing per frame. Start, AwaitEnd and the destructor belong to one thread.
class McftpClient : public device::OnLocalHeap {
 public:
  McftpClient() noexcept;
  /// Only before Start, or after AwaitEnd.
  ~McftpClient();
  McftpClient(const McftpClient&) = delete;
  McftpClient& operator=(const McftpClient&) = delete;

  /// Loads the settings, opens the sockets, joins the public group and starts the thread. Once.
  /// @return false, after a log line that says why, when the client does not run.
  [[nodiscard]] bool Start(const CommandLine& options, const ClientOwner& owner) noexcept;

  /// Waits until the client's thread, if there ever was one, has done its very last act.
  void AwaitEnd() noexcept;

 private:
  /// The machine's record. An event chooses both the next state and the action that runs there.
  struct Machine {
    McftpClient* client;
    const TransitionTable* table;
    Event event;
    State state;
  };
  enum class StatusCode : std::uint32_t {
    kLine = 0,          ///< a log line
    kForgetReport = 1,  ///< the next file begins at 0 percent
    kProgress = 2,      ///< report if a step is reached
    kOpening = 28,      ///< a file is being opened
  };

  // ---- the machine ----
  static DWORD WINAPI StateMachineThread(void* client);
  void RunMachine() noexcept;
  [[nodiscard]] Event Run(Action action) noexcept;

  // The actions. Each returns the event that it stores.
  Event Nop() noexcept;
  Event ResetSession() noexcept;
  Event AwaitAnnouncement() noexcept;
  Event SendRequest() noexcept;
  Event AwaitOack() noexcept;
  Event ReceiveBlocks() noexcept;
  Event CompleteAndDally() noexcept;
  Event Shutdown() noexcept;

  // ---- start ----
  bool Initialize() noexcept;
  bool OpenPublicSocket() noexcept;
  void OpenDebugSocket() noexcept;
  void OpenUserInterfaceSockets() noexcept;
  void LogBanner() noexcept;
  bool StartThread() noexcept;

  // ---- log and status ----
  [[gnu::format(printf, 2, 3)]] void Log(const char* format, ...) noexcept;
  /// @param line  for kLine
  void LogAndStatus(StatusCode code, const char* line = nullptr) noexcept;
  void SendLine(const char* line) noexcept;
  void ReportProgress() noexcept;
  [[nodiscard]] bool ReportIsDue(float percent) const noexcept;
  void SendStatus(float percent) noexcept;

  // ---- frames ----
  [[nodiscard]] bool ReceiveFrame(std::uint32_t timeout_ms) noexcept;
  void ApplyRole() noexcept;
  [[nodiscard]] bool SendAck(std::uint16_t block) noexcept;
  [[nodiscard]] bool SendNak() noexcept;
  void LogNakError() noexcept;
  void SendError(std::uint16_t code, const char* message) noexcept;

  // ---- announcement ----
  void ReadAnnouncement() noexcept;
  [[nodiscard]] bool IsForThisDevice() noexcept;
  void AnswerForPreviousFile() noexcept;
  Event AcceptFile() noexcept;
  [[nodiscard]] bool MakeOutputFile() noexcept;
  [[nodiscard]] bool OpenOutputFile() noexcept;
  [[nodiscard]] bool OpenInNewDirectory(std::string_view directory) noexcept;
  /// The name as the output file knows it: without "RAM:".
  [[nodiscard]] const char* output_name() const noexcept;

  // ---- request ----
  Event EndZeroLengthFile() noexcept;
  Event JoinPrivateGroup() noexcept;

  // ---- blocks ----
  [[nodiscard]] bool AnswerRole() noexcept;
  [[nodiscard]] Event HandleData() noexcept;
  [[nodiscard]] bool TakeBlock() noexcept;
  [[nodiscard]] bool WriteBlockToFile() noexcept;
  void CheckOverrun() noexcept;
  void LeaveNakModeWhenCaughtUp() noexcept;
  /// A file has at most as many blocks as have numbers.
  [[nodiscard]] std::uint16_t BlockCount16() const noexcept {
    return static_cast<std::uint16_t>(session_.block_count);
  }
  [[nodiscard]] bool HasNakedLast() const noexcept {
    return progress_.last_naked == BlockCount16();
  }

  // ---- completion ----
  void CompleteFile() noexcept;
  void SetTimeAndAttributes() noexcept;
  Event Dally() noexcept;
  [[nodiscard]] Event EventAfterDally() const noexcept;

  Machine machine_;
  device::CriticalSection lock_;  ///< around counters, status and what the log needs
  device::EventHandle thread_ended_;
  bool thread_started_ = false;
  ClientOwner owner_;
  CommandLine options_;
  Settings settings_;
  RunCounters counters_;

  FrameLink link_;
  UdpEndpoint debug_;      ///< the syslog server, and the socket to it
  UdpEndpoint local_ui_;   ///< the user interface on this device, and the socket to it
  UdpEndpoint remote_ui_;  ///< nothing says where that one is
  Frame frame_;            ///< the frame in hand

  Session session_;
  base::FixedText<kMaxFileName + 1> file_name_;  ///< as announced
  bool file_is_known_ = false;        ///< file_name_ is in hand: announcements of it are not heard
  TimeStamp time_stamp_;              ///< survives files that bring none
  Role role_ = Role::kPassive;        ///< survives files, too
  bool duplicate_ = false;            ///< the last block had come before
  bool error_received_ = false;       ///< only kept
  bool private_group_known_ = false;  ///< what follows is this session's
  std::uint32_t private_address_ = 0;
  std::uint16_t private_port_ = 0;
  std::uint32_t requests_sent_ = 0;  ///< for this announcement
  FileProgress progress_;
  OverrunWatch overrun_;
  BlockBitmap bitmap_;
  device::LocalObject<device::File> file_;
  bool file_is_ram_ = false;

  static constexpr std::size_t kMaxLine = 2048;  ///< characters
  char line_[kMaxLine + 1];
  char debug_line_[kMaxLine + 32];
  WCHAR wide_line_[kMaxLine + 1];
};

}  // namespace mcftp
