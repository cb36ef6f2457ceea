#include "upgrade/multicast_status.h"

#include <cstring>

#include "device/local_memory.h"
#include "device/socket_wait.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"
#include "upgrade/progress.h"

namespace upgrade {
namespace {

constexpr int kBufferSize = 2048;
constexpr std::uint32_t kFirstPort = 5655;
constexpr std::uint32_t kLastPort = 65535;
constexpr DWORD kNewFilePauseMs = 10;
constexpr DWORD kEndWaitMs = 2000;

/// @return the datagram's length, negative when the socket is of no more use.
int ReceiveInto(SOCKET socket, std::uint8_t* buffer) noexcept {
  std::memset(buffer, 0, kBufferSize);
  const int length =
      recvfrom(socket, reinterpret_cast<char*>(buffer), kBufferSize, 0, nullptr, nullptr);
  // Longer than any report, and so from a stranger: what was cut off would not be looked at anyway.
  const bool cut = length == SOCKET_ERROR && WSAGetLastError() == WSAEMSGSIZE;
  return cut ? kBufferSize : length;
}

/// Shows what comes until the socket is closed.
void ShowReports(SOCKET socket, std::uint8_t* buffer) noexcept {
  StatusDisplay display;
  for (;;) {
    if (device::WaitForSocket(socket, device::SocketUse::kRead, 0) == device::SocketWait::kError) {
      report::Log("Orvenix - MCStatusThread, select error\r\n");
      return;
    }
    const int length = ReceiveInto(socket, buffer);
    if (length < 0) {
      report::Log("Orvenix - MCStatusThread - recvfrom got error\r\n");
      return;
    }
    mcftp::StatusDatagram status;
    if (mcftp::DecodeStatus(buffer, static_cast<std::size_t>(length), status)) display.Show(status);
  }
}

DWORD WINAPI StatusThread(void* argument) {
  const auto buffer = device::LocalBlock<std::uint8_t>::Allocate(kBufferSize);
  if (buffer) ShowReports(reinterpret_cast<SOCKET>(argument), buffer.get());
  return 0;
}

}  // namespace

void StatusDisplay::Show(const mcftp::StatusDatagram& status) noexcept {
  if (status.file_name != shown_name_.view()) {
    report::SetFileProgress(0);
    Sleep(kNewFilePauseMs);
    shown_name_.Assign(status.file_name);
    report::ShowStatus("%s", shown_name_.c_str());
  }
  report::SetFileProgress(status.percent);
  // KEPT ODDITY: a file that is reported as complete twice counts twice.
  if (status.percent == 100) AddReceivedBytes(status.file_size);
}

bool StatusListener::Bind() noexcept {
  if (!library_.Start() || !socket_.Create()) return false;
  for (std::uint32_t port = kFirstPort; port <= kLastPort; ++port) {
    if (socket_.Bind(static_cast<std::uint16_t>(port))) return true;
  }
  return false;
}

bool StatusListener::Listen() noexcept {
  // The thread gets the socket's number and nothing of this object, which it may outlive.
  thread_.Reset(CreateThread(nullptr, 0, StatusThread, reinterpret_cast<void*>(socket_.handle()), 0,
                             nullptr));
  return static_cast<bool>(thread_);
}

bool StatusListener::Start() noexcept {
  if (Bind() && Listen()) return true;
  Stop();
  return false;
}

void StatusListener::Stop() noexcept {
  socket_.Close();
  if (thread_) WaitForSingleObject(thread_.get(), kEndWaitMs);
  thread_.Reset();
  library_.Stop();
}

}  // namespace upgrade
