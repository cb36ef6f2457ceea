#include "net/virtual/virtual_network.h"

#include <utility>

#include "net/virtual/tcp.h"

namespace sim {
namespace {

[[nodiscard]] bool Fits(const Endpoint& wanted, const Endpoint& found) {
  return wanted.address == found.address && (wanted.port == 0 || wanted.port == found.port);
}

}  // namespace

Fabric& VirtualNetwork::Find(World& world) {
  World::Lock lock;
  if (!Fabric::inside()) lock = world.Acquire();
  return world.Shared<Fabric>();
}

VirtualNetwork::VirtualNetwork(World& world) : world_(world), fabric_(Find(world)) {}

World::Lock VirtualNetwork::Enter() const {
  return Fabric::inside() ? World::Lock() : world_.Acquire();
}

void VirtualNetwork::SetHost(Address address, HostState state) {
  const World::Lock lock = Enter();
  fabric_.SetState(address, state);
}

void VirtualNetwork::AddName(std::string_view name, Address address) {
  const World::Lock lock = Enter();
  fabric_.AddName(name, address);
}

void VirtualNetwork::SetDefaultLink(const LinkProfile& profile) {
  const World::Lock lock = Enter();
  fabric_.SetDefaultLink(profile);
}

void VirtualNetwork::SetLink(Address from, Address to, const LinkProfile& profile) {
  const World::Lock lock = Enter();
  fabric_.SetLink(from, to, profile);
}

void VirtualNetwork::SetLinks(Address a, Address b, const LinkProfile& profile) {
  const World::Lock lock = Enter();
  fabric_.SetLink(a, b, profile);
  fabric_.SetLink(b, a, profile);
}

void VirtualNetwork::Stall(Address from, Address to) {
  const World::Lock lock = Enter();
  fabric_.Between(from, to).Stall();
}

void VirtualNetwork::Release(Address from, Address to) {
  const World::Lock lock = Enter();
  fabric_.Release(from, to);
}

void VirtualNetwork::SetDatagramFilter(Fabric::DatagramFilter filter) {
  const World::Lock lock = Enter();
  fabric_.SetFilter(std::move(filter));
}

void VirtualNetwork::AddFault(const StreamFault& fault) {
  const World::Lock lock = Enter();
  fabric_.AddFault(fault);
}

void VirtualNetwork::ResetConnections(Address a, Address b) {
  // As an action of its own: a reset tells both ends, and servers are told in actions only.
  At(now(), [&fabric = fabric_, a, b] {
    for (const auto& connection : fabric.Connections()) {
      const Address first = connection->endpoint(0).address;
      const Address second = connection->endpoint(1).address;
      if ((first == a && second == b) || (first == b && second == a)) connection->Break();
    }
  });
}

std::size_t VirtualNetwork::open_connections() const {
  const World::Lock lock = Enter();
  return fabric_.Connections().size();
}

void VirtualNetwork::StartCapture() {
  const World::Lock lock = Enter();
  fabric_.SetCapturing(true);
}

void VirtualNetwork::StopCapture() {
  const World::Lock lock = Enter();
  fabric_.SetCapturing(false);
}

std::vector<Frame> VirtualNetwork::Frames() const {
  const World::Lock lock = Enter();
  return fabric_.frames();
}

std::string VirtualNetwork::FramesText() const {
  std::string text;
  for (const Frame& frame : Frames()) text += ToText(frame) + '\n';
  return text;
}

std::string VirtualNetwork::StreamBytes(const Endpoint& from, const Endpoint& to) const {
  std::string bytes;
  for (const Frame& frame : Frames()) {
    const bool wanted = frame.kind == FrameKind::kSegment;
    if (wanted && Fits(from, frame.from) && Fits(to, frame.to)) bytes += frame.bytes;
  }
  return bytes;
}

void VirtualNetwork::At(Micros when, std::function<void()> action) {
  const World::Lock lock = Enter();
  fabric_.At(when, std::move(action));
}

}  // namespace sim
