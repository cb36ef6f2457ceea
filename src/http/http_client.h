// Fetches the files of a job from the upgrade server.
#pragma once

#include <coredll.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "base/text.h"
#include "http/response_head/response_head.h"
#include "http/socket_io.h"

namespace device {
class File;
}

namespace http {

/// Bytes of this job that arrived by HTTP, in files that were complete and checked. Sent with every
/// request and with the report; the upgrade thread sets it to 0 at its start.
extern std::atomic<std::uint32_t> BundleRx;
/// 1 while files are fetched because multicast may not have delivered them, else 0. Sent likewise.
extern std::atomic<std::uint32_t> HttpFallback;

/// Room for the longest URL of a job: base URL, source and the counters behind it.
inline constexpr std::size_t kUrlCapacity = 640;
using UrlText = base::WideFixedText<kUrlCapacity>;

/// What the device tells the server about itself. Null texts count as empty.
struct Identity {
  const char* type;
  const char* family;
  const char* model;
  const char* serial_number;
  const char* core_name;  ///< the device's unique id
};

/// One connection to the upgrade server, kept from file to file while address and port agree, and
/// the file that is being fetched.
///
/// The upgrade thread's; nothing here locks. Lives in LocalAlloc memory.
class CHTTPClient : public CSocketIO {
 public:
  /// Called after every block written but the first.
  /// @param total   bytes of the whole file
  /// @param so_far  bytes of it written
  using Progress = void (*)(CHTTPClient* client, std::uint32_t total, std::uint32_t so_far);

  /// Receive buffer, and the largest checkpoint block that a server may ask for, in bytes.
  static constexpr std::uint32_t kBufferSize = 16384;

  CHTTPClient() noexcept = default;
  /// Closes file and connection at once.
  ~CHTTPClient();

  static void* operator new(std::size_t size) noexcept;
  static void operator delete(void* client) noexcept;

  /// Connects to the server of `url`, or keeps the connection there is when it goes to the same
  /// address and port.
  /// @param url   "http://HOST:PORT/PATH"; either kind of slash. Null fails without a log line.
  /// @param path  receives what stands behind the slash that ends the port
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

  /// Where the next Get writes: a path on the device. A path of more than 259 characters, and one
  /// that begins with "RAM:" while there is no RAM store, makes Get fail as a file that cannot be
  /// opened.
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
  HANDLE transfer_semaphore_ = nullptr;
  Progress progress_ = nullptr;
  bool crc_check_ = true;
  bool crc_good_ = true;
};

}  // namespace http
