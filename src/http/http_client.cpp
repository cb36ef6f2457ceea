#include "http/http_client.h"

#include "http/texts.h"
#include "http/url.h"
#include "report/log/log.h"

namespace http {

using report::Log;

std::atomic<std::uint32_t> BundleRx{0};
std::atomic<std::uint32_t> HttpFallback{0};

namespace {

constexpr std::uint32_t kStillConnectedMs = 1;

std::uint32_t Resolve(const UrlParts& url) noexcept {
  const UrlText host(url.host);
  Log(texts::kGetHostIp, device::NarrowText<kUrlCapacity>(host.view()).c_str(), url.port);
  return CSocketIO::GetHostIp(host.c_str());
}

}  // namespace

CHTTPClient::CHTTPClient() noexcept = default;
CHTTPClient::~CHTTPClient() = default;

bool CHTTPClient::OpenURL(const WCHAR* url, UrlText& path) noexcept {
  path.Clear();
  if (url == nullptr) return false;
  Log(texts::kOpenEntering, device::NarrowText<kUrlCapacity>(url).c_str());
  const auto parts = ParseUrl(url);
  if (!parts || !path.Assign(parts->path)) {
    Log(texts::kParseError);
    return false;
  }
  const std::uint32_t address = Resolve(*parts);
  const auto port = static_cast<std::uint16_t>(parts->port);
  return KeepsConnection(address, port) || OpenConnection(address, port);
}

bool CHTTPClient::KeepsConnection(std::uint32_t address, std::uint16_t port) noexcept {
  if (!is_open()) return false;
  if (SocketWriteable(kStillConnectedMs) && port == connected_port_ &&
      address == connected_address_) {
    Log(texts::kAlreadyConnected);
    return true;
  }
  Close();
  OutputDebugStringW(TEXT("OpenURL  closing connection"));
  return false;
}

bool CHTTPClient::OpenConnection(std::uint32_t address, std::uint16_t port) noexcept {
  if (!CreateTcpSocket()) {
    OutputDebugStringW(TEXT("OpenURL  can not create socket"));
    Log(texts::kNoSocket);
    return false;
  }
  Log(texts::kConnecting, static_cast<std::int32_t>(address));
  if (!Connect(address, port, timeout_ms())) {
    Log(texts::kNoConnection);
    Close();
    return false;
  }
  connected_port_ = port;
  connected_address_ = address;
  Log(texts::kOpenExiting);
  return true;
}

bool CHTTPClient::AllocateBuffer() noexcept {
  if (!buffer_) buffer_ = device::LocalBlock<char>::Allocate(kBufferSize);
  return static_cast<bool>(buffer_);
}

void CHTTPClient::SetIdentity(const Identity& identity) noexcept {
  type_.Assign(base::View(identity.type));
  family_.Assign(base::View(identity.family));
  model_.Assign(base::View(identity.model));
  serial_number_.Assign(base::View(identity.serial_number));
  SetCoreName(identity.core_name);
}

void CHTTPClient::SetCoreName(const char* core_name) noexcept {
  core_name_.Assign(base::View(core_name));
}

Identity CHTTPClient::identity() const noexcept {
  return {type_.c_str(), family_.c_str(), model_.c_str(), serial_number_.c_str(),
          core_name_.c_str()};
}

void CHTTPClient::SetDestination(const WCHAR* path) noexcept {
  destination_fits_ = destination_.Assign(path);
}

void CHTTPClient::CloseFile() noexcept {
  if (file_) file_->Close();
}

Counters CurrentCounters() noexcept {
  return {BundleRx.load(std::memory_order_relaxed), HttpFallback.load(std::memory_order_relaxed)};
}

void CHTTPClient::SendUpgradeComplete(const char* error_text) noexcept {
  Log(texts::kReportEntering);
  if (AllocateBuffer()) {
    const std::size_t length =
        FormatReport(buffer_.get(), kBufferSize, core_name_.c_str(), CurrentCounters(), error_text);
    Log("%s", buffer_.get());
    static_cast<void>(SendData(buffer_.get(), static_cast<std::uint32_t>(length)));
  }
  Log(texts::kReportExiting);
}

}  // namespace http
