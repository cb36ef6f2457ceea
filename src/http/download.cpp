// CHTTPClient::Get: one file from the server to the device.
#include "base/text.h"
#include "device/file_crc.h"
#include "device/flash/ram_file.h"
#include "http/http_client.h"
#include "http/texts.h"
#include "http/url.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"

namespace http {

using report::Log;
using report::ShowStatus;

namespace {

constexpr std::size_t kRequestArea = 32768;
constexpr DWORD kRoundPauseMs = 50;
constexpr std::string_view kRamPrefix = "RAM:";

bool IsRamFile(const char* destination) noexcept {
  return base::StartsWith(base::View(destination), kRamPrefix);
}

/// The name by which its kind of file knows `destination`.
const char* NameOf(const char* destination) noexcept {
  return destination + (IsRamFile(destination) ? kRamPrefix.size() : 0);
}

/// The store may have been made for the job; whoever comes first makes it.
void PrepareRamStore() noexcept {
  if (device::HasRAMStore()) return;
  if (device::InitRAMStore()) {
    ShowStatus(texts::kShowRamReady);
  } else {
    ShowStatus(texts::kShowNoRam);
  }
}

/// What writes to `destination`. @return empty when there is no memory for it.
device::LocalObject<device::File> FileFor(const char* destination) noexcept {
  if (!IsRamFile(destination)) return device::LocalObject<device::File>(new device::File);
  device::LocalObject<device::File> file(new device::RAMFile);
  PrepareRamStore();
  Log(texts::kRamFile, NameOf(destination));
  return file;
}

/// @return 0, or why there is no CRC-32 of `destination`, `length` bytes long.
std::uint32_t ComputeCrc(const char* destination, std::uint32_t length,
                         std::uint32_t* crc) noexcept {
  if (!IsRamFile(destination)) {
    Log(texts::kFileCrc);
    return device::FILECRC32(destination, crc);
  }
  Log(texts::kRamFileCrc);
  return device::RAMFILECRC32(NameOf(destination), crc, length, destination);
}

/// CREATE_ALWAYS refuses a file that an earlier round has given one of these attributes.
bool OpenProtected(device::File& file, const char* path, std::uint32_t size) noexcept {
  constexpr DWORD kProtecting =
      FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM;
  const DWORD attributes = file.GetAttributes(path);
  return attributes != INVALID_FILE_ATTRIBUTES && (attributes & kProtecting) != 0 &&
         file.SetAttributes(path, attributes & ~kProtecting) &&
         file.OpenForWriting(path, false, size);
}

/// The server's address as the request names it.
// KEPT ODDITY: one byte swap too many shows the four bytes in reverse order, 2.0.0.10 for 10.0.0.2.
// Servers in the field expect it.
base::FixedText<16> HostText(std::uint32_t address) noexcept {
  return CSocketIO::IPToString(htonl(address));
}

/// Writes the log lines of the fields that were read before `error` was found.
void LogHead(HeadError error, const ResponseHead& head) noexcept {
  if (error == HeadError::kNotOk || error == HeadError::kNoLength) return;
  if (!head.attributes) Log(texts::kNoAttributes);
  if (head.time_stamp) {
    Log(texts::kTimeStamp, base::FixedText<kMaxTimeStamp + 1>(*head.time_stamp).c_str());
  } else {
    Log(texts::kNoTimeStamp);
  }
  if (error == HeadError::kNoCrc || error == HeadError::kBlockTooLarge) return;
  if (head.checkpoint_size) Log(texts::kCheckpoints);
}

const WCHAR* DebugText(HeadError error) noexcept {
  switch (error) {
    case HeadError::kNotOk: return TEXT("get - no 200 ok\r\n");
    case HeadError::kNoLength: return TEXT("get - no length\r\n");
    case HeadError::kNoCrc: return TEXT("get - no CRC32\r\n");
    case HeadError::kBlockTooLarge: return TEXT("get - Chk Pnt Blk size error\r\n");
    case HeadError::kNone:
    case HeadError::kNoEnd: break;
  }
  return nullptr;
}

}  // namespace

bool CHTTPClient::Get(const WCHAR* path) noexcept {
  const base::WideView wanted =
      FromFirstLetter(path == nullptr ? base::WideView{} : base::WideView{path});
  if (wanted.empty()) {
    Log(texts::kBadReturn1);
    return false;
  }
  const device::NarrowText<kUrlCapacity> narrow(wanted);
  // No limit: a server that keeps sending a damaged file is asked until it sends a right one.
  for (;;) {
    const Round round = FetchOnce(narrow.c_str());
    if (round != Round::kRepeat) return round == Round::kComplete;
  }
}

CHTTPClient::Round CHTTPClient::FetchOnce(const char* path) noexcept {
  {
    const auto request = device::LocalBlock<char>::Allocate(kRequestArea);
    if (!AllocateBuffer() || !request) {
      Log(texts::kBadAlloc);
      return Round::kFailed;
    }
    const std::size_t length =
        FormatRequest(request.get(), kRequestArea, path, HostText(connected_address_).c_str(),
                      identity(), CurrentCounters());
    if (!SendRequest(request.get(), length)) return Fail(2, nullptr);
  }
  ResponseHead head;
  std::string_view body;
  const Round outcome = ReceiveHead(head, body);
  return outcome == Round::kComplete ? ReceiveFile(head, body) : outcome;
}

bool CHTTPClient::SendRequest(const char* request, std::size_t length) noexcept {
  Log(texts::kBeforeRequest);
  Log("%s", request);
  Log(texts::kAfterRequest);
  return SendData(request, static_cast<std::uint32_t>(length)) == length;
}

/// Closes the connection. `number` is that of the log line; 0 for a failure without one.
CHTTPClient::Round CHTTPClient::Fail(int number, const WCHAR* debug_text) noexcept {
  if (debug_text != nullptr) OutputDebugStringW(debug_text);
  Close();
  if (number != 0) Log(texts::kBadReturn, number);
  return Round::kFailed;
}

/// Closes the connection after the file could not be made or filled.
CHTTPClient::Round CHTTPClient::FailWithFile() noexcept {
  CloseFile();
  return Fail(0, nullptr);
}

/// Closes file and connection after a file that needed no receiving.
CHTTPClient::Round CHTTPClient::EndAtOnce() noexcept {
  CloseFile();
  Close();
  return Round::kComplete;
}

/// @return kComplete when there is a body to receive; `body` is what came of it.
CHTTPClient::Round CHTTPClient::ReceiveHead(ResponseHead& head, std::string_view& body) noexcept {
  if (!SocketReadable(timeout_ms())) return Fail(3, nullptr);
  const int received = ReadData(buffer_.get(), kBufferSize);
  if (received <= 0) return Fail(4, nullptr);
  const std::string_view block(buffer_.get(), static_cast<std::size_t>(received));
  const HeadError error = ParseResponseHead(block, crc_check_, kBufferSize, head);
  LogHead(error, head);
  head.time_stamp.reset();  // a view into the buffer, which the body overwrites
  // A head that does not end here would be written into the file.
  if (error == HeadError::kNoEnd) return Fail(0, nullptr);
  if (error != HeadError::kNone) return Fail(static_cast<int>(error), DebugText(error));
  body = base::Part(block, head.body_offset);
  return Round::kComplete;
}

CHTTPClient::Round CHTTPClient::ReceiveFile(const ResponseHead& head,
                                            std::string_view first) noexcept {
  const char* const path = destination_.c_str();
  const std::uint32_t length = head.content_length;
  if (!OpenDestination(length)) {
    ShowStatus(texts::kShowOpenError);
    ShowStatus("%s", path);
    Log(texts::kOpenError, path);
    return FailWithFile();
  }
  Log(texts::kOpened, path);
  if (length == 0) {
    ShowStatus(texts::kShowEmptyFile);
    Log(texts::kEmptyFile, path);
    return EndAtOnce();
  }
  // Never more than the file's length, whatever the server sends.
  const auto begun = static_cast<std::uint32_t>(first.size() < length ? first.size() : length);
  // Without a byte of the body there is nothing to point at, which the platform may not take.
  if (!WriteBlock(0, begun == 0 ? buffer_.get() : first.data(), begun)) {
    ShowStatus(texts::kShowWriteError, path);
    Log(texts::kFirstWriteError);
    return FailWithFile();
  }
  if (begun == length) {
    // KEPT ODDITY: a file that comes in one piece with its head is taken as it is, without a look
    // at CRC and attributes.
    Log(texts::kCompleteAtOnce);
    return EndAtOnce();
  }
  const Body outcome = ReceiveRest(length, begun);
  if (outcome == Body::kReadError) return FailWithFile();
  const bool closed = file_->Close();
  const std::uint32_t attributes = head.attributes.value_or(0);
  file_->SetAttributes(path, attributes);
  Log(texts::kAttributes, path, static_cast<std::int32_t>(attributes), closed ? 1 : 0);
  const bool good =
      outcome == Body::kComplete && (!crc_check_ || CheckCrc(length, head.crc32.value_or(0)));
  if (good)
    BundleRx.store(BundleRx.load(std::memory_order_relaxed) + length, std::memory_order_relaxed);
  Sleep(kRoundPauseMs);
  return good ? Round::kComplete : Round::kRepeat;
}

bool CHTTPClient::OpenDestination(std::uint32_t size) noexcept {
  const char* const path = destination_.c_str();
  file_ = FileFor(path);
  if (!file_ || !destination_fits_) return false;
  if (file_->OpenForWriting(NameOf(path), false, size)) return true;
  return file_->last_error() == ERROR_ACCESS_DENIED && OpenProtected(*file_, path, size);
}

CHTTPClient::Body CHTTPClient::ReceiveRest(std::uint32_t length, std::uint32_t position) noexcept {
  while (position != length) {
    if (!SocketReadable(timeout_ms())) {
      Log(texts::kServerSilent);
      return Body::kBroken;
    }
    const int received = ReceiveBlock(length - position);
    if (received <= 0) {
      ShowStatus(texts::kShowReadError);
      Log(texts::kReadError);
      return Body::kReadError;
    }
    const auto size = static_cast<std::uint32_t>(received);
    if (!WriteBlock(position, buffer_.get(), size)) {
      Log(texts::kWriteError);
      return Body::kBroken;
    }
    position += size;
    if (progress_ != nullptr) progress_(this, length, position);
    if (transfer_semaphore_ != nullptr) ReleaseSemaphore(transfer_semaphore_, 1, nullptr);
  }
  Log(texts::kSizeMatch);
  return Body::kComplete;
}

/// Receives at most `most` bytes of the body from a readable connection.
/// @return what recv says.
int CHTTPClient::ReceiveBlock(std::uint32_t most) noexcept {
  ULONG waiting = 0;
  ioctlsocket(socket_handle(), static_cast<LONG>(FIONREAD), &waiting);
  if (waiting == 0) {
    // Readable without data is a connection that has ended: waiting again would never stop.
    char next = 0;
    const int seen = recv(socket_handle(), &next, 1, MSG_PEEK);
    if (seen <= 0) return seen;
  }
  return ReadData(buffer_.get(), most < kBufferSize ? most : kBufferSize);
}

bool CHTTPClient::WriteBlock(std::uint32_t position, const char* bytes,
                             std::uint32_t size) noexcept {
  return file_->Seek(position) && file_->Write(bytes, size);
}

bool CHTTPClient::CheckCrc(std::uint32_t length, std::uint32_t expected) noexcept {
  const char* const path = destination_.c_str();
  OutputDebugStringW(TEXT("performing CRC check\r\n"));
  std::uint32_t computed = 0;
  if (ComputeCrc(path, length, &computed) != 0) {
    Log(texts::kNoCrcComputed);
    return false;
  }
  crc_good_ = computed == expected;
  if (crc_good_) {
    OutputDebugStringW(TEXT("CRC ok\r\n"));
    Log(texts::kGoodCrc);
    return true;
  }
  ShowStatus(texts::kShowCrcFailed);
  OutputDebugStringW(TEXT("CRC failed\r\n"));
  Log(texts::kCrcError, path, static_cast<std::int32_t>(expected),
      static_cast<std::int32_t>(computed));
  return false;
}

}  // namespace http
