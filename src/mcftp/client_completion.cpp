// The end of a file.
#include <coredll.h>

#include "mcftp/client.h"

namespace mcftp {

Event McftpClient::CompleteAndDally() noexcept {
  CompleteFile();
  SetTimeAndAttributes();
  return Dally();
}

/// KEPT ODDITY: the file's size decides whether it is right, so blocks missing in its middle are
/// not noticed; validation finds them.
void McftpClient::CompleteFile() noexcept {
  file_->Flush();
  std::uint32_t size = 0;
  file_->GetSize(&size);
  const bool right = size == session_.file_size;
  {
    const device::CriticalSectionGuard guard(lock_);
    ++(right ? counters_.files_received : counters_.size_mismatches);
  }
  if (!right) {
    // The size that was found wrong, which is not always the number of bytes received.
    Log("Rx size mismatch (Tx size: %u, Rx bytes: %u)", static_cast<unsigned>(session_.file_size),
        static_cast<unsigned>(size));
  }
  Log("File transfer complete (%u bytes).", static_cast<unsigned>(progress_.bytes));
  Log("%u files received (%u total bytes)", static_cast<unsigned>(counters_.files_received),
      static_cast<unsigned>(counters_.total_bytes));
  Log("%u file size mismatches", static_cast<unsigned>(counters_.size_mismatches));
}

void McftpClient::SetTimeAndAttributes() noexcept {
  SYSTEMTIME time = {};
  time.wYear = time_stamp_.year;
  time.wMonth = time_stamp_.month;
  time.wDay = time_stamp_.day;
  time.wHour = time_stamp_.hour;
  time.wMinute = time_stamp_.minute;
  time.wSecond = time_stamp_.second;
  const bool timed = file_->SetTime(device::TimeKind::kLastWrite, time);
  Log("%s", timed ? "Timestamp updated" : "Failed to update timestamp");
  if (!file_->Close()) {
    Log("Failed to close: %s", output_name());
    return;
  }
  const bool marked = file_->SetAttributes(output_name(), session_.attributes);
  Log("%s", marked ? "Attributes updated" : "Failed to update attributes");
  Log("File closed: %s", output_name());
}

/// Stays for a while, in case the server has not heard the last answer.
Event McftpClient::Dally() noexcept {
  Log("Dallying...");
  file_is_known_ = false;
  while (ReceiveFrame(settings_.dally_timeout_ms)) {
    const bool asks = frame_.header.Is(Opcode::kOptionAck) && role_ != Role::kPassive;
    if (!asks) return EventAfterDally();
    Log("Resending ACK for block number %u (last)", static_cast<unsigned>(BlockCount16()));
    static_cast<void>(SendAck(BlockCount16()));
  }
  Log("Dally timeout expired");
  return session_.last_file ? Event::EventShutdown : Event::EventTimeout;
}

/// What the frame in hand ends the dally with.
///
/// KEPT ODDITY: an announcement does no more than that; the file starts with the next copy of it.
Event McftpClient::EventAfterDally() const noexcept {
  if (session_.last_file) return Event::EventShutdown;
  if (frame_.header.Is(Opcode::kData)) return Event::EventTimeout;
  if (frame_.header.Is(Opcode::kAnnouncement)) return Event::EventAnnouncement;
  if (frame_.header.Is(Opcode::kError)) return Event::EventErrorFrame;
  return Event::EventAbort;
}

}  // namespace mcftp
