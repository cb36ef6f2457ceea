#include "upgrade/multicast_launch.h"

#include <cstdint>

#include "base/format.h"
#include "base/text.h"
#include "mcftp/start.h"
#include "report/log/log.h"
#include "upgrade/multicast_status.h"

namespace upgrade {
namespace {

/// The longest command line of a job is 259 characters, what is added to it 24.
using CommandLine = base::FixedText<320>;

/// Tells the client where its progress is listened to.
void AddStatusPort(CommandLine& line, std::uint16_t port) noexcept {
  base::FixedText<32> options;
  base::Format(options.data(), options.capacity(), " -UA=127.0.0.1 -UP=%d", static_cast<int>(port));
  line.Append(options.view());
}

}  // namespace

void RunMulticastTransfer(const UpgradeConfig& job) noexcept {
  CommandLine line(base::View(job.GetMCProcessParms()));
  if (line.empty()) return;
  StatusListener listener;
  if (listener.Start()) AddStatusPort(line, listener.port());
  report::Log("Orvenix - StartMulticastClient - mc.Start, !%s!\r\n", line.c_str());
  static_cast<void>(mcftp::StartMulticastClient(line.data()));
  listener.Stop();
  report::Log("Orvenix - StartMulticastClient - Exiting\r\n");
}

}  // namespace upgrade
