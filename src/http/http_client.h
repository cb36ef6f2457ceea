// Fetches the files of a job from the upgrade server.
#pragma once

#include <coredll.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "base/text.h"
#include "device/file.h"
#include "device/local_memory.h"
#include "device/wide_text.h"
#include "http/request.h"
#include "http/response_head/response_head.h"
#include "http/socket_io.h"

namespace http {

// NOLINTBEGIN(readability-identifier-naming,bugprone-dynamic-static-initializers): agreed names
/// Bytes of this job that arrived by HTTP, in files that were complete and checked. Sent with every
/// request and with the report; the upgrade thread sets it to 0 at its start.
extern std::atomic<std::uint32_t> BundleRx;
/// 1 while files are fetched because multicast may not have delivered them, else 0. Sent likewise.
extern std::atomic<std::uint32_t> HttpFallback;
// NOLINTEND(readability-identifier-naming,bugprone-dynamic-static-initializers)
/// Both as they stand.
[[nodiscard]] Counters CurrentCounters() noexcept;

/// Room for the longest URL of a job: base URL, source and the counters behind it.
inline constexpr std::size_t kUrlCapacity = 640;
using UrlText = base::WideFixedText<kUrlCapacity>;

/// One connection to the upgrade server, kept from file to file while address and port agree, and
/// the file that is being fetched.
///
/// The upgrade thread's; nothing here locks.
class CHTTPClient : public CSocketIO, public device::OnLocalHeap {
 public:
  /// Called after every block written but the first.
  /// @param total   bytes of the whole file
  /// @param so_far  bytes of it written
  using Progress = void (*)(CHTTPClient* client, std::uint32_t total, std::uint32_t so_far);

  /// Receive buffer, and the largest checkpoint block that a server may ask for, in bytes.
  static constexpr std::uint32_t kBufferSize = 16384;

  CHTTPClient() noexcept;
  /// Closes file and connection at once.
  ~CHTTPClient();

  /// Connects to the server of `url`, or keeps the connection there is when it goes to the same
  /// address and port.
  /// @param url   "http://HOST:PORT/PATH"; either kind of slash. Null fails without a log line.
  /// @param path  receives what stands behind the slash that ends the port; a path that does not
  /// fit
  ///   counts as an unreadable URL
  [[nodiscard]] bool OpenURL(const WCHAR* url, UrlText& path) noexcept;

  /// Fetches `path` into the current destination. Asks again, without a limit, after a stalled
  /// transfer, a failed write and a wrong CRC; gives up when the connection fails or the answer is
  /// not usable, and then closes the connection.
  ///
  /// The file is complete when the result is true. Its CRC was compared unless CRC checking is off,
  /// the file is empty, or all of it came in one piece with the head of the answer.
  [[nodiscard]] bool Get(const WCHAR* path) noexcept;

  /// Tells the server that the job's transfer is over, on whatever connection there is. No answer
  /// is read and no failure reported.
  /// @param error_text  why the job failed; null or empty when it did not
  void SendUpgradeComplete(const char* error_text) noexcept;

  /// The texts are copied, each cut to 63 characters.
  void SetIdentity(const Identity& identity) noexcept;
  void SetCoreName(const char* core_name) noexcept;

  /// Where the next Get writes: a path on the device, or "RAM:" and a name for a file of the RAM
  /// store, which Get makes if it is not there yet. A path of more than 259 characters makes Get
  /// fail as a file that cannot be opened.
  void SetDestination(const WCHAR* path) noexcept;

  /// Null for none.
  void SetProgress(Progress progress) noexcept { progress_ = progress; }

  /// A semaphore that is raised by one after every block written but the first; null for none. Not
  /// owned.
  void SetTransferSemaphore(HANDLE semaphore) noexcept { transfer_semaphore_ = semaphore; }

  /// Whether the server must send a CRC-32 and the file is compared with it. On unless switched
  /// off.
  void SetCrcCheck(bool on) noexcept { crc_check_ = on; }
  /// The outcome of the last comparison; true before the first.
  [[nodiscard]] bool crc_good() const noexcept { return crc_good_; }

  /// Closes the file of a transfer that did not end; nothing when none is open.
  void CloseFile() noexcept;

 private:
  /// How one round of asking for a file ended.
  enum class Round : std::uint8_t { kComplete, kFailed, kRepeat };
  /// How receiving the body ended.
  enum class Body : std::uint8_t { kComplete, kBroken, kReadError };

  [[nodiscard]] bool KeepsConnection(std::uint32_t address, std::uint16_t port) noexcept;
  [[nodiscard]] bool OpenConnection(std::uint32_t address, std::uint16_t port) noexcept;
  [[nodiscard]] bool AllocateBuffer() noexcept;
  [[nodiscard]] Identity identity() const noexcept;

  // The steps of Get, in download.cpp.
  Round FetchOnce(const char* path) noexcept;
  Round Fail(int number, const WCHAR* debug_text) noexcept;
  Round FailWithFile() noexcept;
  Round EndAtOnce() noexcept;
  [[nodiscard]] bool SendRequest(const char* request, std::size_t length) noexcept;
  Round ReceiveHead(ResponseHead& head, std::string_view& body) noexcept;
  Round ReceiveFile(const ResponseHead& head, std::string_view first) noexcept;
  [[nodiscard]] bool OpenDestination(std::uint32_t size) noexcept;
  Body ReceiveRest(std::uint32_t length, std::uint32_t position) noexcept;
  int ReceiveBlock(std::uint32_t most) noexcept;
  [[nodiscard]] bool WriteBlock(std::uint32_t position, const char* bytes,
                                std::uint32_t size) noexcept;
  [[nodiscard]] bool CheckCrc(std::uint32_t length, std::uint32_t expected) noexcept;

  std::uint16_t connected_port_ = 0;
  std::uint32_t connected_address_ = 0xFFFFFFFFU;
  HANDLE transfer_semaphore_ = nullptr;
  device::LocalBlock<char> buffer_;  ///< kBufferSize bytes; made on first use, kept for the job
  base::FixedText<64> type_;
  base::FixedText<64> family_;
  base::FixedText<64> model_;
  base::FixedText<64> serial_number_;
  base::FixedText<64> core_name_;
  bool crc_check_ = true;
  device::LocalObject<device::File> file_;  ///< of the current transfer
  bool crc_good_ = true;
  Progress progress_ = nullptr;
  device::NarrowText<device::File::kNameSize> destination_;
  bool destination_fits_ = true;
};

}  // namespace http
