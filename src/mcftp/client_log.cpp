// What the client says: log lines, and how far a file has come.
#include <coredll.h>

#include <cstdarg>
#include <cstring>

#include "base/format.h"
#include "device/wide_text.h"
#include "mcftp/client.h"
#include "mcftp/wire/status_datagram.h"

namespace mcftp {
namespace {

constexpr int kPriority = 14;  // facility "user", severity "informational"
constexpr float kAll = 100.0F;
constexpr std::uint32_t kKib = 1024;

bool IsSet(const UdpEndpoint& endpoint) noexcept {
  return endpoint.port() != 0 && endpoint.address().sin_addr.s_addr != 0;
}

}  // namespace

void McftpClient::Log(const char* format, ...) noexcept {
  // Nobody to hear it, as in most runs: the thread was started after both were set.
  if (!IsSet(debug_) && owner_.log == nullptr) return;
  const device::CriticalSectionGuard guard(lock_);
  va_list arguments;
  va_start(arguments, format);
  base::FormatV(line_, sizeof line_, format, arguments);
  va_end(arguments);
  LogAndStatus(StatusCode::kLine, line_);
}

void McftpClient::LogAndStatus(StatusCode code, const char* line) noexcept {
  const device::CriticalSectionGuard guard(lock_);
  switch (code) {
    case StatusCode::kLine: SendLine(line); break;
    case StatusCode::kForgetReport: progress_.reported_percent = 0; break;
    case StatusCode::kProgress: ReportProgress(); break;
    case StatusCode::kOpening: SendStatus(0); break;
  }
}

void McftpClient::SendLine(const char* line) noexcept {
  if (IsSet(debug_)) {
    SYSTEMTIME now = {};
    GetLocalTime(&now);
    // KEPT ODDITY: the priority is padded to three places, so every line begins with "< 14>".
    const std::size_t length = base::Format(
        debug_line_, sizeof debug_line_, "<%3d>%04d-%02d-%02d %02d:%02d:%02d %s", kPriority,
        now.wYear, now.wMonth, now.wDay, now.wHour, now.wMinute, now.wSecond, line);
    debug_.SendTo(debug_, debug_line_, static_cast<std::uint16_t>(length));
  } else if (owner_.log != nullptr) {
    device::ToWide(base::View(line), wide_line_, kMaxLine + 1);
    owner_.log(owner_.context, wide_line_);
  }
}

bool McftpClient::ReportIsDue(float percent) const noexcept {
  if (percent >= kAll) return true;
  const auto step = static_cast<float>(session_.step_percent);
  if (session_.step_percent != 0 && percent >= progress_.reported_percent + step) return true;
  return session_.step_kib != 0 && progress_.bytes_since_report > session_.step_kib * kKib;
}

void McftpClient::ReportProgress() noexcept {
  if (session_.file_size == 0) return;
  const auto ratio = static_cast<float>(progress_.bytes) / static_cast<float>(session_.file_size);
  const float percent = ratio * kAll;
  if (!ReportIsDue(percent)) return;
  progress_.reported_percent = percent;
  progress_.bytes_since_report = 0;
  if (IsSet(local_ui_) || IsSet(remote_ui_)) {
    SendStatus(percent);
  } else if (owner_.window != nullptr && owner_.message != 0) {
    PostMessageW(owner_.window, owner_.message, reinterpret_cast<WPARAM>(file_name_.c_str()),
                 static_cast<LPARAM>(percent));
  }
}

void McftpClient::SendStatus(float percent) noexcept {
  StatusDatagram status;
  status.percent = static_cast<std::uint16_t>(static_cast<std::uint32_t>(percent));
  status.total_bytes = counters_.total_bytes;
  status.file_size = session_.file_size;
  status.file_name = file_name_.view();
  std::uint8_t bytes[kStatusNameOffset + kMaxFileName + 1];
  const std::size_t length = EncodeStatus(status, bytes, sizeof bytes);
  for (UdpEndpoint* const ui : {&local_ui_, &remote_ui_}) {
    if (IsSet(*ui)) ui->SendTo(*ui, bytes, static_cast<std::uint16_t>(length));
  }
}

}  // namespace mcftp
