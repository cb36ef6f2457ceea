#include "net/virtual/stream.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "ce/winsock.h"

namespace sim {

VirtualStreamTransport::~VirtualStreamTransport() {
  if (connection_ != nullptr) connection_->Close(side_, abort_);
  if (backlog_ > 0) fabric_.StopListening(local_);
  for (const auto& connection : waiting_) connection->Close(1, /*abort=*/true);
  if (owns_port_) fabric_.UnbindStream(local_);
}

void VirtualStreamTransport::Changed() {
  fabric_.world().Notify(queue);
}

int VirtualStreamTransport::Bind(const Endpoint& local) {
  local_ = {own_, local.port};
  const int error = fabric_.BindStream(local_);
  owns_port_ = error == 0;
  return error;
}

int VirtualStreamTransport::Connect(const Endpoint& peer) {
  if (!owns_port_) {
    const int error = Bind({});
    if (error != 0) return error;
  }
  const Endpoint to{fabric_.Route(own_, peer.address), peer.port};
  connection_ = std::make_shared<TcpConnection>(fabric_, local_, to);
  connection_->SetBuffers(0, send_buffer_, receive_buffer_);
  connection_->Start(*this);
  return WSAEWOULDBLOCK;
}

int VirtualStreamTransport::ConnectResult() {
  if (connection_->established(0)) return 0;
  const int error = connection_->error(0);
  if (error == 0) return WSAEWOULDBLOCK;
  connection_.reset();
  return error;
}

// ---- accepting ----

int VirtualStreamTransport::Listen(int backlog) {
  constexpr int kLongest = 200;
  backlog_ = static_cast<std::size_t>(std::min(backlog, kLongest));
  return fabric_.Listen(local_, *this);
}

void VirtualStreamTransport::Arrived(std::shared_ptr<TcpConnection> connection) {
  connection->SetBuffers(1, send_buffer_, receive_buffer_);
  waiting_.push_back(std::move(connection));
  Changed();
}

int VirtualStreamTransport::Accept(std::unique_ptr<Transport>& accepted) {
  if (waiting_.empty()) return WSAEWOULDBLOCK;
  auto transport = std::make_unique<VirtualStreamTransport>(fabric_, own_);
  transport->local_ = local_;
  transport->connection_ = std::move(waiting_.front());
  transport->side_ = 1;
  transport->connection_->SetObserver(1, transport.get());
  waiting_.pop_front();
  accepted = std::move(transport);
  return 0;
}

Endpoint VirtualStreamTransport::peer() const {
  return connection_ != nullptr ? connection_->endpoint(1 - side_) : Endpoint{};
}

// ---- bytes ----

int VirtualStreamTransport::Send(const char* bytes, std::size_t size, std::size_t& sent) {
  if (connection_->error(side_) != 0) return connection_->error(side_);
  if (size == 0) return 0;
  sent = connection_->Write(side_, {bytes, size});
  return sent > 0 ? 0 : WSAEWOULDBLOCK;
}

int VirtualStreamTransport::SendTo(const Endpoint& /*to*/, const char* /*bytes*/,
                                   std::size_t /*size*/) {
  return WSAEOPNOTSUPP;
}

int VirtualStreamTransport::Receive(char* bytes, std::size_t size, bool peek, Received& result) {
  if (connection_->error(side_) != 0) return connection_->error(side_);
  if (size == 0) return 0;
  const std::string_view unread = connection_->Unread(side_);
  if (unread.empty()) return connection_->AtEnd(side_) ? 0 : WSAEWOULDBLOCK;
  result.size = std::min(size, unread.size());
  std::memcpy(bytes, unread.data(), result.size);
  if (!peek) connection_->TakeRead(side_, result.size);
  return 0;
}

int VirtualStreamTransport::ShutdownSend() {
  connection_->ShutdownSend(side_);
  return 0;
}

int VirtualStreamTransport::Pending(std::uint32_t& bytes) {
  bytes = static_cast<std::uint32_t>(connection_->Unread(side_).size());
  return 0;
}

unsigned VirtualStreamTransport::Ready(unsigned interest) {
  unsigned ready = 0;
  if (connection_ == nullptr) return waiting_.empty() ? 0 : interest & kReadable;
  const bool broken = connection_->error(side_) != 0;
  const bool ended = connection_->AtEnd(side_);
  if (broken || ended || !connection_->Unread(side_).empty()) ready |= kReadable;
  if (broken || connection_->Room(side_) > 0) ready |= kWritable;
  return ready & interest;
}

// ---- options ----

int VirtualStreamTransport::Join(Address /*group*/) {
  return WSAENOPROTOOPT;
}
int VirtualStreamTransport::Leave(Address /*group*/) {
  return WSAENOPROTOOPT;
}

int VirtualStreamTransport::Tune(Tuning what, int value) {
  if (what == Tuning::kSendBuffer) send_buffer_ = static_cast<std::size_t>(value);
  if (what == Tuning::kReceiveBuffer) receive_buffer_ = static_cast<std::size_t>(value);
  if (connection_ != nullptr) connection_->SetBuffers(side_, send_buffer_, receive_buffer_);
  return 0;
}

}  // namespace sim
