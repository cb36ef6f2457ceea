#include "net/virtual/fabric.h"

#include <algorithm>
#include <utility>

#include "ce/winsock.h"
#include "net/virtual/datagram.h"
#include "net/virtual/stream.h"
#include "net/virtual/tcp.h"

namespace sim {
namespace {

thread_local bool inside_action = false;

std::string LowerCase(std::string_view text) {
  std::string lower(text);
  for (char& c : lower) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c + 32);
  }
  return lower;
}

}  // namespace

Fabric::Fabric(World& world) : world_(world) {}
Fabric::~Fabric() = default;

bool Fabric::inside() {
  return inside_action;
}

std::uint64_t Fabric::At(Micros when, std::function<void()> action) {
  return world_.At(when, [action = std::move(action)] {
    const bool outer = std::exchange(inside_action, true);
    action();
    inside_action = outer;
  });
}

// ---- hosts ----

HostState Fabric::State(Address address) const {
  const auto found = hosts_.find(address);
  return found == hosts_.end() ? HostState::kSilent : found->second.state;
}

void Fabric::AddName(std::string_view name, Address address) {
  names_[LowerCase(name)] = address;
}

std::optional<Address> Fabric::FindName(std::string_view name) const {
  const auto found = names_.find(LowerCase(name));
  if (found == names_.end()) return std::nullopt;
  return found->second;
}

std::unique_ptr<Transport> Fabric::NewTransport(SocketKind kind, Address own) {
  if (kind == SocketKind::kStream) return std::make_unique<VirtualStreamTransport>(*this, own);
  return std::make_unique<VirtualDatagramTransport>(*this, own);
}

Address Fabric::Route(Address from, Address to) const {
  return to == kLocalHost && hosts_.count(kLocalHost) == 0 ? from : to;
}

// ---- links ----

Link& Fabric::Between(Address from, Address to) {
  std::unique_ptr<Link>& link = links_[{from, to}];
  if (link == nullptr) {
    const std::uint64_t way = (std::uint64_t{from} << 32U) | to;
    link = std::make_unique<Link>(world_.seed() * 0xD1342543DE82EF95U + way);
    if (from != to) link->set_profile(default_link_);
  }
  return *link;
}

void Fabric::SetDefaultLink(const LinkProfile& profile) {
  default_link_ = profile;
  for (auto& [way, link] : links_) {
    const bool follows = way.first != way.second && special_links_.count(way) == 0;
    if (follows) link->set_profile(profile);
  }
}

void Fabric::SetLink(Address from, Address to, const LinkProfile& profile) {
  special_links_.insert({from, to});
  Between(from, to).set_profile(profile);
}

void Fabric::Release(Address from, Address to) {
  for (const auto& send : Between(from, to).Release()) send();
}

// ---- ports ----

/// Takes `port`, or the next free one when it is 0. @return false when there is none.
template <typename InUse>
bool Fabric::ChoosePort(Host& host, std::uint16_t& port, InUse in_use) {
  if (port != 0) return !in_use(port);
  constexpr int kPorts = 65536 - 1025;
  for (int tries = 0; tries < kPorts; ++tries) {
    const std::uint16_t next = host.next_port;
    host.next_port = next == 65535 ? std::uint16_t{1025} : static_cast<std::uint16_t>(next + 1);
    if (in_use(next)) continue;
    port = next;
    return true;
  }
  return false;
}

int Fabric::BindStream(Endpoint& local) {
  Host& host = hosts_[local.address];
  const auto in_use = [&](std::uint16_t port) { return host.stream_ports.count(port) != 0; };
  if (!ChoosePort(host, local.port, in_use)) return WSAEADDRINUSE;
  host.stream_ports.insert(local.port);
  return 0;
}

void Fabric::UnbindStream(const Endpoint& local) {
  hosts_[local.address].stream_ports.erase(local.port);
}

int Fabric::Listen(const Endpoint& local, TcpListener& listener) {
  hosts_[local.address].listeners[local.port] = &listener;
  return 0;
}

void Fabric::StopListening(const Endpoint& local) {
  hosts_[local.address].listeners.erase(local.port);
}

TcpListener* Fabric::FindListener(const Endpoint& local) {
  Host& host = hosts_[local.address];
  const auto found = host.listeners.find(local.port);
  return found == host.listeners.end() ? nullptr : found->second;
}

// ---- UDP ----

int Fabric::BindDatagram(Endpoint& local, DatagramSink& sink, bool share) {
  Host& host = hosts_[local.address];
  const auto in_use = [&](std::uint16_t port) {
    const auto found = host.datagram_ports.find(port);
    if (found == host.datagram_ports.end() || found->second.empty()) return false;
    const auto shares = [](const BoundSink& bound) { return bound.shares; };
    return !share || !std::all_of(found->second.begin(), found->second.end(), shares);
  };
  if (!ChoosePort(host, local.port, in_use)) return WSAEADDRINUSE;
  host.datagram_ports[local.port].push_back({&sink, share, {}});
  return 0;
}

void Fabric::UnbindDatagram(const Endpoint& local, DatagramSink& sink) {
  auto& sinks = hosts_[local.address].datagram_ports[local.port];
  const auto is_it = [&](const BoundSink& bound) { return bound.sink == &sink; };
  sinks.erase(std::remove_if(sinks.begin(), sinks.end(), is_it), sinks.end());
}

Fabric::BoundSink* Fabric::FindSink(const Endpoint& local, const DatagramSink& sink) {
  for (BoundSink& bound : hosts_[local.address].datagram_ports[local.port]) {
    if (bound.sink == &sink) return &bound;
  }
  return nullptr;
}

void Fabric::Join(const Endpoint& local, DatagramSink& sink, Address group) {
  if (BoundSink* bound = FindSink(local, sink)) bound->groups.insert(group);
}

void Fabric::Leave(const Endpoint& local, DatagramSink& sink, Address group) {
  if (BoundSink* bound = FindSink(local, sink)) bound->groups.erase(group);
}

/// The hosts that a datagram goes to. Whether a program there wants it is seen when it arrives.
std::vector<Address> Fabric::Receivers(const Endpoint& from, const Endpoint& to,
                                       const SendOptions& options) const {
  if (!IsMulticast(to.address) && to.address != kBroadcastAddress) return {to.address};
  std::vector<Address> receivers;
  for (const auto& [address, host] : hosts_) {
    const bool own = address == from.address;
    if (own ? options.loop : options.ttl > 0) receivers.push_back(address);
  }
  return receivers;
}

void Fabric::SendDatagram(const Endpoint& from, const Endpoint& to, std::string_view bytes,
                          const SendOptions& options) {
  Frame frame{FrameKind::kDatagram, world_.now(), from, to, std::string(bytes), {}};
  for (const Address receiver : Receivers(from, to, options)) {
    Link& link = Between(from.address, receiver);
    const std::vector<Micros> arrivals = link.Datagram(frame.when, bytes.size());
    if (State(receiver) != HostState::kUp || link.stalled()) continue;
    if (filter_ && !filter_(frame, receiver)) continue;
    for (const Micros when : arrivals) {
      frame.arrivals.push_back({receiver, when});
      At(when,
         [this, receiver, from, to, sent = frame.bytes] { Deliver(receiver, from, to, sent); });
    }
  }
  if (capturing_) Record(std::move(frame));
}

void Fabric::Deliver(Address receiver, const Endpoint& from, const Endpoint& to,
                     const std::string& bytes) {
  Host& host = hosts_[receiver];
  const auto found = host.datagram_ports.find(to.port);
  if (found == host.datagram_ports.end() || host.state != HostState::kUp) return;
  const bool to_group = IsMulticast(to.address);
  // A copy: a program may open and close ports while it is called.
  for (const BoundSink& bound : std::vector<BoundSink>(found->second)) {
    if (to_group && bound.groups.count(to.address) == 0) continue;
    if (FindSink({receiver, to.port}, *bound.sink) == nullptr) continue;
    bound.sink->Arrived(from, bytes);
    // One program has the datagram for one host; everyone who asked has those for many.
    if (!to_group && to.address != kBroadcastAddress) return;
  }
}

// ---- TCP ----

std::optional<StreamFault> Fabric::TakeFault(Address from, Address to) {
  for (auto fault = faults_.begin(); fault != faults_.end(); ++fault) {
    const bool matches = (fault->from == kAnyAddress || fault->from == from) &&
                         (fault->to == kAnyAddress || fault->to == to);
    if (!matches || --fault->nth > 0) continue;
    const StreamFault taken = *fault;
    faults_.erase(fault);
    return taken;
  }
  return std::nullopt;
}

void Fabric::Enlist(const std::shared_ptr<TcpConnection>& connection) {
  const auto gone = [](const std::weak_ptr<TcpConnection>& entry) { return entry.expired(); };
  if (connections_.size() >= 64) {
    connections_.erase(std::remove_if(connections_.begin(), connections_.end(), gone),
                       connections_.end());
  }
  connections_.push_back(connection);
}

std::vector<std::shared_ptr<TcpConnection>> Fabric::Connections() {
  std::vector<std::shared_ptr<TcpConnection>> open;
  for (const auto& entry : connections_) {
    if (auto connection = entry.lock(); connection && connection->open()) {
      open.push_back(std::move(connection));
    }
  }
  return open;
}

}  // namespace sim
