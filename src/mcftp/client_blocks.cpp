// Receiving blocks, and answering them as the server has said.
#include <coredll.h>

#include "mcftp/client.h"
#include "mcftp/wire/texts.h"

namespace mcftp {
namespace {

constexpr std::uint16_t kDiskFull = 3;

const char* TextOf(Role role) noexcept {
  switch (role) {
    case Role::kAckMaster: return "Master Client: TRUE (ACKing)";
    case Role::kNakMaster: return "Master Client: TRUE (NAKing)";
    case Role::kPassive: return "Master Client: FALSE (Passive)";
  }
  return "";  // not reached
}

}  // namespace

bool McftpClient::ReceiveFrame(std::uint32_t timeout_ms) noexcept {
  const FileInHand file = {file_is_known_ ? file_name_.view() : std::string_view(),
                           session_.block_size, session_.block_count};
  if (!link_.Receive(timeout_ms, file, frame_)) return false;
  if (frame_.header.Is(Opcode::kData) && frame_.data.block == session_.block_count) {
    Log("Last block received: %u (%u bytes)", static_cast<unsigned>(frame_.data.block),
        static_cast<unsigned>(frame_.data.length));
  }
  if (frame_.header.Is(Opcode::kOptionAck)) ApplyRole();
  return true;
}

/// Every OACK gives a role, whenever it comes. Role bits that name none change nothing.
void McftpClient::ApplyRole() noexcept {
  const Role role = frame_.oack.role.value_or(role_);
  if (role == role_) return;
  role_ = role;
  Log("OACK Received");
  Log("Change in Master Client status");
  Log("%s", TextOf(role));
}

Event McftpClient::ReceiveBlocks() noexcept {
  while (true) {
    if (!ReceiveFrame(settings_.receive_timeout_ms)) {
      Log("Rx file timed out - transfer aborted");
      return Event::EventTimeout;
    }
    if (frame_.header.Is(Opcode::kData)) return HandleData();
    if (frame_.header.Is(Opcode::kAnnouncement)) return Event::EventAnnouncement;
    if (frame_.header.Is(Opcode::kError)) return Event::EventErrorFrame;
    if (!frame_.header.Is(Opcode::kOptionAck)) return Event::EventAbort;
    if (!AnswerRole()) return Event::EventAbort;
    if (role_ == Role::kNakMaster && HasNakedLast()) return Event::EventLastBlock;
  }
}

bool McftpClient::AnswerRole() noexcept {
  switch (role_) {
    case Role::kAckMaster:
      Log("Client elected initial master client (ACK mode)");
      return SendAck(0);
    case Role::kNakMaster: Log("Client elected master client (NAK mode)"); return SendNak();
    case Role::kPassive: Log("Client transitioned to passive mode"); return true;
  }
  return true;  // not reached
}

/// KEPT ODDITY: acknowledging the last block ends the file, whatever is missing before it; and a
/// passive client never ends a file by itself.
Event McftpClient::HandleData() noexcept {
  const std::uint16_t block = frame_.data.block;
  if (role_ == Role::kPassive) CheckOverrun();
  if (!TakeBlock()) return Event::EventAbort;
  if (role_ == Role::kAckMaster && !SendAck(block)) return Event::EventAbort;
  if (role_ == Role::kNakMaster) {
    if (!SendNak()) return Event::EventAbort;
    LeaveNakModeWhenCaughtUp();
  }
  const bool complete = (role_ == Role::kAckMaster && progress_.last_acked == BlockCount16()) ||
                        (role_ == Role::kNakMaster && HasNakedLast());
  return complete ? Event::EventLastBlock : Event::EventData;
}

/// Nothing on the wire says so: the server, which was told of the overrun, knows the block at which
/// the client goes on as it would have.
void McftpClient::LeaveNakModeWhenCaughtUp() noexcept {
  const std::uint16_t recorded = overrun_.recorded_block();
  if (recorded == 0 || progress_.last_naked < recorded) return;
  overrun_.ForgetRecordedBlock();
  role_ = Role::kAckMaster;
  Log("Transitioning from NAK to ACK mode");
}

// ---- the block ----

/// @return false when it could not be written.
bool McftpClient::TakeBlock() noexcept {
  const std::uint16_t block = frame_.data.block;
  duplicate_ = !bitmap_.Mark(block);
  if (duplicate_) {
    Log("Duplicate frame received, block #%u", static_cast<unsigned>(block));
    return true;
  }
  if (!WriteBlockToFile()) {
    SendError(kDiskFull, ErrorText(kDiskFull));
    Log("Failed to write block #%u", static_cast<unsigned>(block));
    return false;
  }
  const device::CriticalSectionGuard guard(lock_);
  counters_.total_bytes += frame_.data.length;
  progress_.bytes += frame_.data.length;
  progress_.bytes_since_report += frame_.data.length;
  ReportProgress();
  ++progress_.blocks;
  progress_.last_written = block;
  return true;
}

/// A block without data counts as written.
bool McftpClient::WriteBlockToFile() noexcept {
  if (frame_.data.length == 0) {
    Log("WARNING: Data length = 0");
    return true;
  }
  const std::uint32_t offset = (frame_.data.block - 1U) * session_.block_size;
  if (!file_->Seek(offset)) {
    Log("WriteBlockToFile - SetFilePointer call failed");
    return false;
  }
  return file_->Write(frame_.data.data, frame_.data.length);
}

void McftpClient::CheckOverrun() noexcept {
  const auto report = overrun_.OnBlock(frame_.data.block, frame_.data.length, progress_.bytes);
  if (!report) return;
  const OverrunTexts texts = TextsOf(*report);
  Log("%s", texts.line);
  for (std::uint32_t sent = 0; sent < settings_.overrun_error_messages; ++sent) {
    SendError(kOverrunCode, texts.message);
  }
}

// ---- answers ----

/// KEPT ODDITY: only a DATA frame clears the duplicate mark, so an ACK that answers an OACK shows
/// how the block before it was.
bool McftpClient::SendAck(std::uint16_t block) noexcept {
  progress_.last_acked = block;
  return link_.Send(EncodeAck({block, duplicate_}, link_.send_buffer(), FrameLink::kSendBuffer));
}

/// Names the first block that is missing, or the last one when none is.
///
/// KEPT ODDITY: a NAK of the last block is sent once between two resets and stands for the whole
/// file, also when just that block is the missing one.
bool McftpClient::SendNak() noexcept {
  const std::uint16_t last = BlockCount16();
  if (progress_.last_naked == last) return true;
  const std::uint32_t missing = bitmap_.FirstMissing();
  const std::uint16_t named = missing < last ? static_cast<std::uint16_t>(missing) : last;
  progress_.last_naked = named;
  if (frame_.header.Is(Opcode::kData) && named < frame_.data.block) LogNakError();
  Log("NAKing block %u of %u", static_cast<unsigned>(named), static_cast<unsigned>(last));
  return link_.Send(EncodeNak({named}, link_.send_buffer(), FrameLink::kSendBuffer));
}

void McftpClient::LogNakError() noexcept {
  Log("***************************************");
  Log("************** NAK ERROR **************");
  Log("***************************************");
  Log("m_pFrame->data.wBlockNumber: %u", static_cast<unsigned>(frame_.data.block));
  Log("m_wNAKBlock: %u", static_cast<unsigned>(progress_.last_naked));
}

/// Whether the server hears of it changes nothing.
void McftpClient::SendError(std::uint16_t code, const char* message) noexcept {
  const ErrorFrame error = {code, base::View(message)};
  static_cast<void>(link_.Send(EncodeError(error, link_.send_buffer(), FrameLink::kSendBuffer)));
}

}  // namespace mcftp
