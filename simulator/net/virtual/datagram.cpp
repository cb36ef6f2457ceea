#include "net/virtual/datagram.h"

#include <algorithm>
#include <cstring>

#include "ce/winsock.h"

namespace sim {
namespace {

// What a datagram takes of the receive buffer besides its bytes.
constexpr std::size_t kOverhead = 32;

}  // namespace

VirtualDatagramTransport::~VirtualDatagramTransport() {
  if (bound_) fabric_.UnbindDatagram(local_, *this);
}

int VirtualDatagramTransport::Bind(const Endpoint& local) {
  local_ = {own_, local.port};
  const int error = fabric_.BindDatagram(local_, *this, shares_port_);
  bound_ = error == 0;
  if (!bound_) return error;
  for (const Address group : groups_) fabric_.Join(local_, *this, group);
  return 0;
}

int VirtualDatagramTransport::Connect(const Endpoint& peer) {
  peer_ = {fabric_.Route(own_, peer.address), peer.port};
  const auto is_stranger = [&](const Datagram& datagram) { return datagram.from != peer_; };
  received_.erase(std::remove_if(received_.begin(), received_.end(), is_stranger), received_.end());
  used_ = 0;
  for (const Datagram& datagram : received_) used_ += datagram.bytes().size() + kOverhead;
  return 0;
}

int VirtualDatagramTransport::Listen(int /*backlog*/) {
  return WSAEOPNOTSUPP;
}
int VirtualDatagramTransport::Accept(std::unique_ptr<Transport>& /*accepted*/) {
  return WSAEOPNOTSUPP;
}

int VirtualDatagramTransport::Send(const char* bytes, std::size_t size, std::size_t& sent) {
  sent = size;
  return SendTo(peer_, bytes, size);
}

int VirtualDatagramTransport::SendTo(const Endpoint& to, const char* bytes, std::size_t size) {
  const Endpoint target{fabric_.Route(own_, to.address), to.port};
  const std::string_view content = size > 0 ? std::string_view(bytes, size) : std::string_view();
  fabric_.SendDatagram(local_, target, content, send_options_);
  return 0;
}

void VirtualDatagramTransport::Arrived(const Endpoint& from, const Payload& bytes) {
  if (peer_.port != 0 && from != peer_) return;
  if (used_ + bytes->size() + kOverhead > room_) return;
  used_ += bytes->size() + kOverhead;
  received_.push_back({from, bytes});
  fabric_.world().Notify(queue);
}

int VirtualDatagramTransport::Receive(char* bytes, std::size_t size, bool peek, Received& result) {
  if (received_.empty()) return WSAEWOULDBLOCK;
  const Datagram& first = received_.front();
  result = {std::min(size, first.bytes().size()), first.bytes().size() > size, first.from};
  if (result.size > 0) std::memcpy(bytes, first.bytes().data(), result.size);
  if (peek) return 0;
  used_ -= first.bytes().size() + kOverhead;
  received_.pop_front();
  return 0;
}

int VirtualDatagramTransport::Pending(std::uint32_t& bytes) {
  bytes = received_.empty() ? 0 : static_cast<std::uint32_t>(received_.front().bytes().size());
  return 0;
}

unsigned VirtualDatagramTransport::Ready(unsigned interest) {
  return interest & (received_.empty() ? kWritable : kReadable | kWritable);
}

int VirtualDatagramTransport::Join(Address group) {
  groups_.push_back(group);
  if (bound_) fabric_.Join(local_, *this, group);
  return 0;
}

int VirtualDatagramTransport::Leave(Address group) {
  groups_.erase(std::remove(groups_.begin(), groups_.end(), group), groups_.end());
  if (bound_) fabric_.Leave(local_, *this, group);
  return 0;
}

int VirtualDatagramTransport::Tune(Tuning what, int value) {
  if (what == Tuning::kReuseAddress) shares_port_ = value != 0;
  if (what == Tuning::kReceiveBuffer) room_ = static_cast<std::size_t>(value);
  if (what == Tuning::kMulticastLoop) send_options_.loop = value != 0;
  if (what == Tuning::kMulticastTtl) send_options_.ttl = value;
  return 0;
}

}  // namespace sim
