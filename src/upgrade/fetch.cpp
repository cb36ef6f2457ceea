#include "upgrade/fetch.h"

#include <coredll.h>

#include "base/format.h"
#include "device/local_memory.h"
#include "device/wide_text.h"
#include "http/http_client.h"
#include "http/job_client.h"
#include "report/log/log.h"
#include "upgrade/paths.h"

namespace upgrade {
namespace {

constexpr DWORD kPauseAfterFailureMs = 3000;

/// The texts of one fetch. Too much for the thread's stack.
struct Transfer {
  base::FixedText<kNarrowUrlSize> url;
  device::WideText<http::kUrlCapacity> wide_url;
  http::UrlText path;
  const char* destination;
  device::WideText<kPathSize> wide_destination;
};
constexpr std::size_t kTransferBuffer = 4096;
static_assert(sizeof(Transfer) <= kTransferBuffer, "one page holds it");

/// One attempt. @return whether the file is there, or taken as done.
bool Attempt(http::CHTTPClient& client, Transfer& transfer, OnFailedGet failed_get) noexcept {
  report::Log("Orvenix - before OpenURL\r\n");
  report::Log("%s", transfer.url.c_str());
  report::Log("\r\n");
  // Converted for each attempt: a conversion that failed once must not spoil all that follow.
  transfer.wide_url.Assign(transfer.url.view());
  transfer.wide_destination.Assign(transfer.destination);
  if (client.OpenURL(transfer.wide_url.c_str(), transfer.path)) {
    client.SetDestination(transfer.wide_destination.c_str());
    if (client.Get(transfer.path.c_str()) || failed_get == OnFailedGet::kTakeAsDone) return true;
  }
  Sleep(kPauseAfterFailureMs);
  return false;
}

}  // namespace

base::FixedText<kNarrowUrlSize> FileUrl(std::string_view base_url, int port,
                                        std::string_view source, std::uint32_t attempt,
                                        std::uint32_t total) noexcept {
  constexpr std::size_t kBehindScheme = 8;
  base::FixedText<kNarrowUrlSize> url(base_url);
  if (base_url.find(':', kBehindScheme) != std::string_view::npos) {
    url.Append(source);
    return url;
  }
  const bool has_slash = !source.empty() && (source[0] == '\\' || source[0] == '/');
  char number[32];
  base::Format(number, sizeof number, ":%d%s", port, has_slash ? "" : "/");
  url.Append(number);
  url.Append(source);
  base::Format(number, sizeof number, ":%d,%d", static_cast<int>(attempt), static_cast<int>(total));
  url.Append(number);
  return url;
}

bool FetchFile(Run& run, const char* source, const char* destination,
               OnFailedGet failed_get) noexcept {
  http::CHTTPClient* const client = http::CreateJobClient(run.job);
  if (client == nullptr) return false;
  const device::LocalBlock<std::uint8_t> buffer =
      device::LocalBlock<std::uint8_t>::Allocate(kTransferBuffer);
  if (!buffer) return false;
  Transfer& transfer = *new (buffer.get()) Transfer;
  // Made once: all attempts to get one file name the same number.
  transfer.url = FileUrl(run.job.GetBaseURL(), run.job.GetHTTPPort(), source, run.fetch_attempt,
                         run.files_to_fetch);
  transfer.destination = destination;
  bool done = false;
  while (!done) {
    // Before each attempt: a folder that could not be made once must not spoil all that follow.
    if (!IsRamName(destination)) CreateFolderOf(destination);
    done = Attempt(*http::CreateJobClient(run.job), transfer, failed_get);
    ++run.fetch_attempt;
    client->Close();
    client->CloseFile();
  }
  return true;
}

}  // namespace upgrade
