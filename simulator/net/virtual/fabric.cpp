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

/// One direction between two hosts as one number.
std::uint64_t Way(Address from, Address to) {
  return (std::uint64_t{from} << 32U) | to;
}

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
  const std::uint64_t way = Way(from, to);
  std::unique_ptr<Link>& link = links_[way];
  if (link == nullptr) {
    link = std::make_unique<Link>(world_.seed() * 0xD1342543DE82EF95U + way);
    if (from != to) link->set_profile(default_link_);
  }
  return *link;
}

void Fabric::SetDefaultLink(const LinkProfile& profile) {
  default_link_ = profile;
  for (auto& [way, link] : links_) {
    const bool to_itself = way >> 32U == (way & 0xFFFFFFFFU);
    const bool follows = !to_itself && special_links_.count(way) == 0;
    if (follows) link->set_profile(profile);
  }
}

void Fabric::SetLink(Address from, Address to, const LinkProfile& profile) {
  special_links_.insert(Way(from, to));
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

Fabric::BoundSink* Fabric::FindSink(Host& host, std::uint16_t port, const DatagramSink& sink) {
  const auto found = host.datagram_ports.find(port);
  if (found == host.datagram_ports.end()) return nullptr;
  for (BoundSink& bound : found->second) {
    if (bound.sink == &sink) return &bound;
  }
  return nullptr;
}

void Fabric::Join(const Endpoint& local, DatagramSink& sink, Address group) {
  BoundSink* const bound = FindSink(hosts_[local.address], local.port, sink);
  if (bound != nullptr) bound->groups.insert(group);
}

void Fabric::Leave(const Endpoint& local, DatagramSink& sink, Address group) {
  BoundSink* const bound = FindSink(hosts_[local.address], local.port, sink);
  if (bound != nullptr) bound->groups.erase(group);
}

/// The hosts that a datagram goes to. Whether a program there wants it is seen when it arrives.
void Fabric::FindReceivers(const Endpoint& from, const Endpoint& to, const SendOptions& options) {
  receivers_.clear();
  if (!IsMulticast(to.address) && to.address != kBroadcastAddress) {
    const auto host = hosts_.find(to.address);
    receivers_.emplace_back(to.address, host == hosts_.end() ? nullptr : &host->second);
    return;
  }
  for (auto& [address, host] : hosts_) {
    const bool own = address == from.address;
    if (own ? options.loop : options.ttl > 0) receivers_.emplace_back(address, &host);
  }
}

void Fabric::Forward(Frame& frame, Address receiver, Host& host) {
  Link& link = Between(frame.from.address, receiver);
  link.Datagram(frame.when, frame.bytes.size(), arrivals_);
  if (host.state != HostState::kUp || link.stalled()) return;
  if (filter_ && !filter_(frame, receiver)) return;
  for (const Micros when : arrivals_) {
    if (capturing_ || filter_) frame.arrivals.push_back({receiver, when});
    copies_.push_back({when, &host});
  }
}

/// Copies that arrive at one instant come by one action.
void Fabric::Dispatch(const Frame& frame) {
  const auto earlier = [](const Copy& a, const Copy& b) { return a.when < b.when; };
  if (!std::is_sorted(copies_.begin(), copies_.end(), earlier)) {
    std::stable_sort(copies_.begin(), copies_.end(), earlier);
  }
  const auto payload = std::make_shared<const std::string>(frame.bytes);
  for (auto first = copies_.begin(); first != copies_.end();) {
    const auto is_later = [&](const Copy& copy) { return copy.when > first->when; };
    const auto last = std::find_if(first, copies_.end(), is_later);
    At(first->when, [this, payload, from = frame.from, to = frame.to,
                     receivers = std::vector<Copy>(first, last)] {
      for (const Copy& copy : receivers) Deliver(*copy.receiver, from, to, payload);
    });
    first = last;
  }
}

void Fabric::SendDatagram(const Endpoint& from, const Endpoint& to, std::string_view bytes,
                          const SendOptions& options) {
  Frame frame{FrameKind::kDatagram, world_.now(), from, to, std::string(bytes), {}};
  FindReceivers(from, to, options);
  copies_.clear();
  for (const auto& [receiver, host] : receivers_) {
    if (host != nullptr) Forward(frame, receiver, *host);
  }
  Dispatch(frame);
  if (capturing_) Record(std::move(frame));
}

void Fabric::Deliver(Host& receiver, const Endpoint& from, const Endpoint& to,
                     const Payload& bytes) {
  const auto found = receiver.datagram_ports.find(to.port);
  if (found == receiver.datagram_ports.end() || receiver.state != HostState::kUp) return;
  const bool to_group = IsMulticast(to.address);
  // Noted first: a program may open and close ports while it is called.
  std::vector<DatagramSink*> asked = std::exchange(asked_, {});
  for (const BoundSink& bound : found->second) {
    if (!to_group || bound.groups.count(to.address) != 0) asked.push_back(bound.sink);
  }
  for (DatagramSink* const sink : asked) {
    if (FindSink(receiver, to.port, *sink) == nullptr) continue;
    sink->Arrived(from, bytes);
    // One program has the datagram for one host; everyone who asked has those for many.
    if (!to_group && to.address != kBroadcastAddress) break;
  }
  asked.clear();
  asked_ = std::move(asked);
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
