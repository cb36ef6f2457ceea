#include "mcftp/client.h"

namespace mcftp {

McftpClient::McftpClient() noexcept
    : machine_{this, &kTransitions, Event::EventAbort, State::StateReset},
      thread_ended_(CreateEventW(nullptr, TRUE, FALSE, nullptr)),
      overrun_(settings_.rx_blocks_before_overrun, settings_.overrun_percent_threshold) {}

McftpClient::~McftpClient() {
  file_.Reset();
  link_.Close();
}

void McftpClient::AwaitEnd() noexcept {
  if (!thread_started_) return;
  // The object must not go while its thread is at work, whatever a wait says.
  while (WaitForSingleObject(thread_ended_.get(), INFINITE) != WAIT_OBJECT_0) Sleep(1);
}

DWORD WINAPI McftpClient::StateMachineThread(void* client) {
  auto& self = *static_cast<McftpClient*>(client);
  self.Log("McftpClient::StateMachineThread started");
  self.RunMachine();
  self.Log("McftpClient::StateMachineThread stopping");
  // There is no other way to let the client go; after it there is no client.
  while (SetEvent(self.thread_ended_.get()) == 0) Sleep(1);
  return 0;
}

void McftpClient::RunMachine() noexcept {
  while (true) {
    const TransitionTable& table = *machine_.table;
    const auto& row = table[static_cast<std::size_t>(machine_.state)];
    machine_.event = Run(row[static_cast<std::size_t>(machine_.event)].action);
    if (machine_.state == State::StateShutdown) return;
    machine_.state = row[static_cast<std::size_t>(machine_.event)].next;
  }
}

Event McftpClient::Run(Action action) noexcept {
  using Member = Event (McftpClient::*)() noexcept;
  static constexpr Member kMembers[kActions] = {&McftpClient::Nop,
                                                &McftpClient::ResetSession,
                                                &McftpClient::AwaitAnnouncement,
                                                &McftpClient::SendRequest,
                                                &McftpClient::AwaitOack,
                                                &McftpClient::ReceiveBlocks,
                                                &McftpClient::CompleteAndDally,
                                                &McftpClient::Shutdown};
  return (this->*kMembers[static_cast<std::size_t>(action)])();
}

/// Where combinations end that must not occur.
///
/// KEPT ODDITY: the machine stays here for good, and with it whoever waits for the client. Nothing
/// that a server can send leads here: StateTableTest walks all of it.
Event McftpClient::Nop() noexcept {
  constexpr DWORD kStepMs = 10000;
  Log("State machine called nop()");
  Log("Event: %u  State: %u", static_cast<unsigned>(machine_.event),
      static_cast<unsigned>(machine_.state));
  while (true) Sleep(kStepMs);
}

/// KEPT ODDITY: this is the only place where the blocks acknowledged and named last are forgotten,
/// and it comes before the client answers for the file before (AnswerForPreviousFile). So an answer
/// given there counts in the next file: when that has as many blocks, its NAK of the last one
/// counts as sent. The role is not forgotten at all.
Event McftpClient::ResetSession() noexcept {
  if (file_) file_->Close();
  file_is_known_ = false;
  {
    const device::CriticalSectionGuard guard(lock_);
    progress_ = FileProgress();
    overrun_.Reset();
  }
  LogAndStatus(StatusCode::kForgetReport);
  return Event::EventReady;
}

Event McftpClient::Shutdown() noexcept {
  if (link_.private_group_joined()) {
    Log("Leaving multicast group: %s", link_.private_group_text().c_str());
    link_.LeavePrivateGroup();
  }
  if (owner_.stopped != nullptr) {
    Log("Client shutting down...");
    owner_.stopped(owner_.context);
  }
  return Event::EventShutdown;
}

}  // namespace mcftp
