// Asking for the file, and becoming a member of its group.
#include <coredll.h>

#include "base/format.h"
#include "mcftp/client.h"
#include "mcftp/mcast_log.h"

namespace mcftp {
namespace {

constexpr char kLastFileEnds[] = "Last file flag is set, shutting down state machine";

}  // namespace

Event McftpClient::SendRequest() noexcept {
  Log("Establishing session with %s", link_.server_text().c_str());
  if (requests_sent_ >= settings_.max_session_retries) {
    Log("Server not responding to RRQ");
    return Event::EventNoServer;
  }
  if (requests_sent_ > 0) {
    {
      const device::CriticalSectionGuard guard(lock_);
      ++progress_.retries;
    }
    Log("RRQ Retry: %u", static_cast<unsigned>(requests_sent_));
  }
  const ReadRequest request = {session_.last_file, session_.transfer_id, file_name_.view()};
  if (!link_.Send(EncodeReadRequest(request, link_.send_buffer(), FrameLink::kSendBuffer))) {
    return Event::EventAbort;
  }
  Log("RRQ sent to %s", link_.server_text().c_str());
  ++requests_sent_;
  return session_.file_size == 0 ? EndZeroLengthFile() : Event::EventRequestSent;
}

/// The request was all that there is to such a file.
///
/// KEPT ODDITY: the last file is left open by this, and gets neither time nor attributes.
Event McftpClient::EndZeroLengthFile() noexcept {
  Log("Zero length file announced: %s", file_name_.c_str());
  if (!session_.last_file) return Event::EventAbort;
  Log("%s", kLastFileEnds);
  AppendToMcastLog(kLastFileEnds);
  {
    const device::CriticalSectionGuard guard(lock_);
    progress_.bytes = 1;  // of 1: the progress is 100 percent
    session_.file_size = 1;
  }
  LogAndStatus(StatusCode::kProgress);
  return Event::EventShutdown;
}

Event McftpClient::AwaitOack() noexcept {
  if (!ReceiveFrame(session_.oack_wait_ms)) {
    Log("Timeout waiting for Option Ack, retrying...");
    return Event::EventTimeout;
  }
  if (frame_.header.Is(Opcode::kOptionAck)) return JoinPrivateGroup();
  if (frame_.header.Is(Opcode::kAnnouncement)) return Event::EventAnnouncement;
  if (frame_.header.Is(Opcode::kData)) return Event::EventData;
  if (!frame_.header.Is(Opcode::kError)) return Event::EventAbort;
  error_received_ = true;
  return Event::EventErrorFrame;
}

/// Only a session's first OACK says which group it is.
///
/// KEPT ODDITY: it is never answered, whatever role it gives; the role counts all the same.
Event McftpClient::JoinPrivateGroup() noexcept {
  if (!private_group_known_) {
    private_address_ = frame_.oack.address;
    private_port_ = frame_.oack.port;
    private_group_known_ = true;
    Log("Session established to receive file on:");
    Log("%s   port: %u", ToText(htonl(private_address_)).c_str(),
        static_cast<unsigned>(private_port_));
  }
  if (!link_.JoinPrivateGroup(private_address_, private_port_)) {
    Log("Failed to join private multicast group: %s", link_.private_group_text().c_str());
    return Event::EventJoinFailed;
  }
  Log("Private multicast group joined: %s", link_.private_group_text().c_str());
  return Event::EventJoined;
}

}  // namespace mcftp
