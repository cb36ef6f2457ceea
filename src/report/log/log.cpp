#include "report/log/log.h"

#include <coredll.h>

#include <cstdarg>
#include <cstring>
#include <utility>

#include "base/format.h"
#include "device/local_memory.h"
#include "device/lock.h"
#include "mcftp/udp_socket/udp_socket.h"

namespace report {
namespace {

constexpr const char* kLogFile = "\\FileXfer.log";
constexpr int kPriority = 14;  // facility "user", severity "informational"
constexpr std::size_t kLineSize = 1152;

/// An open way to the syslog server.
struct SyslogLink : device::OnLocalHeap {
  mcftp::SocketLibrary library;
  mcftp::UdpEndpoint socket;
  mcftp::UdpEndpoint server;
};

/// As old as the process, and without a destructor: a target outlives its job.
struct State {
  device::Lock lock;  ///< around what follows
  std::uint16_t syslog_port = 0;
  SyslogLink* syslog = nullptr;  ///< owned; null when there is no socket
  FILE* file = nullptr;          ///< stays open between lines only while there is a syslog port
};
State state;

/// @return null when there is no socket to be had.
SyslogLink* OpenSyslog(std::uint16_t port, std::uint32_t address) noexcept {
  device::LocalObject<SyslogLink> link(new SyslogLink);
  if (!link || !link->library.Start() || !link->socket.Create()) return nullptr;
  link->server.SetAddress(address);
  link->server.SetPort(port);
  return link.Release();
}

void SendToSyslog(const char* message) noexcept {
  if (state.syslog == nullptr) return;
  SYSTEMTIME now = {};
  GetLocalTime(&now);
  char line[kLineSize];
  // KEPT ODDITY: the priority is padded to three places, so every line begins with "< 14>".
  base::Format(line, sizeof line, "<%3d>%04d-%02d-%02d %02d:%02d:%02d %s", kPriority, now.wYear,
               now.wMonth, now.wDay, now.wHour, now.wMinute, now.wSecond, message);
  state.syslog->socket.SendTo(state.syslog->server, line,
                              static_cast<std::uint16_t>(std::strlen(line)));
}

void CloseFile() noexcept {
  if (state.file != nullptr) fclose(state.file);
  state.file = nullptr;
}

void Write(const char* message) noexcept {
  // The file is opened for a line to syslog, too, and then stays open and empty.
  if (state.file == nullptr) state.file = fopen(kLogFile, "a");
  if (state.syslog_port != 0) {
    SendToSyslog(message);
  } else if (state.file != nullptr) {
    fwrite(message, 1, std::strlen(message), state.file);
    CloseFile();
  }
}

}  // namespace

void Log(const char* format, ...) noexcept {
  const DWORD error = GetLastError();
  char message[kMaxLogMessage + 1];
  va_list arguments;
  va_start(arguments, format);
  base::FormatV(message, sizeof message, format, arguments);
  va_end(arguments);
  {
    const device::LockGuard lock(state.lock);
    Write(message);
  }
  SetLastError(error);
}

void SetSyslogTarget(int port, const char* address) noexcept {
  const device::LockGuard lock(state.lock);
  delete std::exchange(state.syslog, nullptr);
  state.syslog_port = static_cast<std::uint16_t>(port);
  const std::uint32_t server = mcftp::ParseAddress(address);
  // With an address that does not read as one the port stays, and lines are lost.
  if (state.syslog_port == 0 || server == INADDR_NONE) return;
  state.syslog = OpenSyslog(state.syslog_port, server);
  if (state.syslog == nullptr) state.syslog_port = 0;
}

void CloseLogFile() noexcept {
  const device::LockGuard lock(state.lock);
  CloseFile();
}

}  // namespace report
