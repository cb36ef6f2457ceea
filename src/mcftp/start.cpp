#include "mcftp/start.h"

#include <coredll.h>

#include <atomic>

#include "base/text.h"
#include "device/local_memory.h"
#include "mcftp/client.h"
#include "mcftp/mcast_log.h"
#include "mcftp/rules/command_line.h"

namespace mcftp {
namespace {

constexpr DWORD kPollMs = 250;

/// One run of a client, as its owner sees it.
struct Run {
  std::atomic<bool> running{true};
  const ClientOwner* caller;
};

void ClearRunningMark(void* context) {
  auto& run = *static_cast<Run*>(context);
  const ClientOwner* const caller = run.caller;
  if (caller != nullptr && caller->stopped != nullptr) caller->stopped(caller->context);
  run.running.store(false, std::memory_order_relaxed);
}

void PassLineOn(void* context, const WCHAR* line) {
  const ClientOwner& caller = *static_cast<Run*>(context)->caller;
  caller.log(caller.context, line);
}

ClientOwner OwnerOf(Run& run) noexcept {
  ClientOwner owner;
  if (run.caller != nullptr) owner = *run.caller;
  owner.context = &run;
  owner.stopped = &ClearRunningMark;
  if (owner.log != nullptr) owner.log = &PassLineOn;
  return owner;
}

}  // namespace

std::int32_t StartMulticastClient(const char* command_line, const ClientOwner* owner) noexcept {
  CommandLine options;
  if (!ParseCommandLine(base::View(command_line), options)) return -1;
  const device::LocalObject<McftpClient> client(new McftpClient);
  if (!client) return -1;
  AppendToMcastLog("Command line parsed and multicast client instantiated");
  Run run{{true}, owner};
  if (!client->Start(options, OwnerOf(run))) return -1;
  while (run.running.load(std::memory_order_relaxed)) Sleep(kPollMs);
  // The mark is cleared by a thread that is still at work on the client.
  client->AwaitEnd();
  return 0;
}

}  // namespace mcftp
