#include "http/job_client.h"

#include "base/format.h"
#include "http/texts.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"

namespace http {
namespace {

using report::Log;

constexpr std::uint32_t kFetchTimeoutMs = 20000;

/// The upgrade thread's, as the client is.
struct State {
  CHTTPClient* client;  ///< owned
  bool sockets_started;
};
State state;

void StartSockets() noexcept {
  constexpr WORD kVersion = MAKEWORD(1, 1);
  WSADATA data = {};
  state.sockets_started = WSAStartup(kVersion, &data) == 0;
  if (!state.sockets_started || data.wVersion == kVersion) return;
  // The job goes on all the same, and its connections fail one by one.
  WSACleanup();
  state.sockets_started = false;
}

/// @return false when there is no memory for a client.
bool MakeClient() noexcept {
  state.client = new CHTTPClient;
  if (state.client == nullptr) return false;
  StartSockets();
  return true;
}

void ShowProgress(CHTTPClient* /*client*/, std::uint32_t total, std::uint32_t so_far) noexcept {
  report::SetFileProgress(static_cast<int>(std::uint64_t{so_far} * 100 / total));
}

/// Too large for a frame together with what OpenURL needs.
struct UrlWork {
  UrlText url;
  UrlText path;
};

void SendReport(CHTTPClient& client, const UpgradeConfig& job, const char* error_text) noexcept {
  const auto work = device::LocalBlock<UrlWork>::Allocate();
  if (!work) return;
  char url[kUrlCapacity];
  base::Format(url, sizeof url, "%s:%d", job.GetBaseURL(), job.GetHTTPPort());
  device::ToWide(url, work->url.data(), UrlText::capacity());
  // The report goes out, and into the log, whether or not there is a connection.
  static_cast<void>(client.OpenURL(work->url.c_str(), work->path));
  client.SendUpgradeComplete(error_text);
}

}  // namespace

CHTTPClient* JobClient() noexcept {
  return state.client;
}

CHTTPClient* CreateJobClient(const UpgradeConfig& job) noexcept {
  if (state.client != nullptr) {
    if (!state.sockets_started) StartSockets();
    return state.client;
  }
  if (!MakeClient()) return nullptr;
  state.client->set_timeout_ms(kFetchTimeoutMs);
  state.client->SetIdentity(
      {job.GetType(), job.GetFamily(), job.GetModel(), job.GetSerialNumber(), job.GetUniqueId()});
  state.client->SetProgress(ShowProgress);
  return state.client;
}

void SendUpgradeComplete(const UpgradeConfig& job, const char* error_text) noexcept {
  Log(texts::kEngineReportEntering);
  if (state.client != nullptr || MakeClient()) {
    if (!base::View(job.GetUniqueId()).empty()) state.client->SetCoreName(job.GetUniqueId());
    SendReport(*state.client, job, error_text);
  }
  Log(texts::kEngineReportExiting);
}

void ReleaseJobClient() noexcept {
  if (state.client == nullptr) return;
  state.client->CloseAtOnce();
  delete state.client;
  state.client = nullptr;
  if (state.sockets_started) WSACleanup();
  state.sockets_started = false;
}

}  // namespace http
