#include "http/socket_io.h"

#include <cstring>

#include "base/format.h"
#include "device/socket_wait.h"
#include "device/wide_text.h"
#include "http/texts.h"
#include "report/log/log.h"

namespace http {
namespace {

using device::SocketUse;
using device::SocketWait;
using report::Log;

constexpr std::uint32_t kSegment = 1460;  // data in one TCP segment on Ethernet
constexpr DWORD kFirstDelayMs = 20;
constexpr DWORD kDelayStepMs = 20;
constexpr DWORD kLongDelayMs = 10000;  // not doubled any more from here on
constexpr DWORD kDrainLimitMs = 60000;

void ReportConnectError(std::int32_t error) noexcept {
  Log(texts::kConnectError, error);
  char text[40];
  base::Format(text, sizeof text, "connect error, %d\r\n", error);
  OutputDebugStringW(device::WideText<40>(text).c_str());
}

}  // namespace

std::uint32_t CSocketIO::GetHostIp(const WCHAR* host) noexcept {
  device::NarrowText<128> name;
  if (!name.Assign(host) || name.empty()) return 0;
  const std::uint32_t address = inet_addr(name.c_str());
  if (address != INADDR_NONE) return address;
  const hostent* found = gethostbyname(name.c_str());
  if (found == nullptr || found->h_addr_list[0] == nullptr) return 0;
  std::uint32_t first = 0;
  if (found->h_length == static_cast<int>(sizeof first)) {
    std::memcpy(&first, found->h_addr_list[0], sizeof first);
  }
  return first;
}

base::FixedText<16> CSocketIO::IPToString(std::uint32_t address) noexcept {
  in_addr wrapped = {};
  wrapped.s_addr = address;
  base::FixedText<16> text;
  if (const char* dotted = inet_ntoa(wrapped)) {
    text.Assign(dotted);
  } else {
    Log(texts::kBadAddress);
  }
  return text;
}

bool CSocketIO::CreateTcpSocket() noexcept {
  socket_ = socket(AF_INET, SOCK_STREAM, IPPROTO_TCP);
  if (!is_open()) {
    Log(texts::kInvalidSocket);
    return false;
  }
  ULONG blocking = 0;
  ioctlsocket(socket_, static_cast<LONG>(FIONBIO), &blocking);
  return true;
}

bool CSocketIO::Connect(std::uint32_t address, std::uint16_t port,
                        std::uint32_t timeout_ms) noexcept {
  if (!is_open()) return false;
  sockaddr_in server = {};
  server.sin_family = AF_INET;
  server.sin_port = htons(port);
  server.sin_addr.s_addr = address;
  if (connect(socket_, reinterpret_cast<const sockaddr*>(&server), sizeof server) == SOCKET_ERROR) {
    ReportConnectError(static_cast<std::int32_t>(GetLastError()));
    Close();
    return false;
  }
  if (!SocketWriteable(timeout_ms)) return false;
  Log(texts::kConnected);
  return true;
}

bool CSocketIO::SocketWriteable(std::uint32_t timeout_ms) const noexcept {
  switch (device::WaitForSocket(socket_, SocketUse::kWrite, timeout_ms)) {
    case SocketWait::kReady: return true;
    case SocketWait::kTimeout: Log(texts::kWriteableTimeout); break;
    case SocketWait::kNotSet: Log(texts::kWriteableNotSet); break;
    case SocketWait::kError:
      Log(texts::kWriteableError, static_cast<std::int32_t>(GetLastError()));
      break;
  }
  return false;
}

bool CSocketIO::SocketReadable(std::uint32_t timeout_ms) const noexcept {
  return device::WaitForSocket(socket_, SocketUse::kRead, timeout_ms) == SocketWait::kReady;
}

std::uint32_t CSocketIO::SendData(const char* bytes, std::uint32_t length) noexcept {
  std::uint32_t sent = 0;
  DWORD delay_ms = kFirstDelayMs;
  while (sent != length) {
    const std::uint32_t left = length - sent;
    const int now =
        send(socket_, bytes + sent, static_cast<int>(left < kSegment ? left : kSegment), 0);
    if (now > 0) {
      if (delay_ms > kFirstDelayMs) delay_ms -= kDelayStepMs;
      sent += static_cast<std::uint32_t>(now);
    } else if (now == SOCKET_ERROR && GetLastError() == static_cast<DWORD>(WSAEWOULDBLOCK)) {
      if (delay_ms < kLongDelayMs) delay_ms *= 2;
      Sleep(delay_ms);
    } else {
      break;
    }
  }
  return sent;
}

int CSocketIO::ReadData(char* buffer, std::uint32_t size) noexcept {
  return recv(socket_, buffer, static_cast<int>(size), 0);
}

bool CSocketIO::Close() noexcept {
  if (!is_open()) return false;
  // A socket that never came to a connection has nothing to take in and never becomes readable:
  // waiting for it would cost the whole time-out.
  if (shutdown(socket_, SD_SEND) == 0 || GetLastError() != static_cast<DWORD>(WSAENOTCONN)) Drain();
  Log(texts::kClose);
  CloseAtOnce();
  return true;
}

void CSocketIO::CloseAtOnce() noexcept {
  if (is_open()) closesocket(socket_);
  socket_ = INVALID_SOCKET;
}

void CSocketIO::Drain() noexcept {
  char scratch[512];
  const DWORD begin = GetTickCount();
  for (DWORD spent = 0; spent < kDrainLimitMs; spent = GetTickCount() - begin) {
    const DWORD left = kDrainLimitMs - spent;
    const bool bounded = timeout_ms_ != 0 && timeout_ms_ < left;
    if (!SocketReadable(bounded ? timeout_ms_ : left)) return;
    if (recv(socket_, scratch, sizeof scratch, 0) <= 0) return;
  }
}

}  // namespace http
