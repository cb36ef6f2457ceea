// A test's hand on the network of a virtual world.
//
//   sim::VirtualNetwork network(world);
//   network.SetDefaultLink({.delay = 5ms, .loss = 0.02});   // fields by name, see LinkProfile
//   network.AddFault({server, device, 40000, sim::StreamFaultKind::kReset});
//   network.StartCapture();
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "net/endpoint.h"
#include "net/virtual/fabric.h"
#include "net/virtual/frame.h"
#include "net/virtual/link.h"
#include "world/world.h"

namespace sim {

/// A view of the world's one network: cheap, and as many as one likes. Every device of the world is
/// a host on it by its profile's address; servers add theirs (net/virtual/virtual_server.h). An
/// address without a host answers nothing. May be used by any thread, and within the calls that the
/// network makes to servers.
class VirtualNetwork {
 public:
  explicit VirtualNetwork(World& world);

  // ---- hosts ----

  /// kUp makes a host of the address.
  void SetHost(Address address, HostState state);
  /// What gethostbyname answers on every device.
  void AddName(std::string_view name, Address address);

  // ---- links ----

  /// Of every link between two different hosts that was not set by itself, now and later.
  void SetDefaultLink(const LinkProfile& profile);
  /// The way from one host to another. Frames under way keep their time.
  void SetLink(Address from, Address to, const LinkProfile& profile);
  /// Both ways.
  void SetLinks(Address a, Address b, const LinkProfile& profile);

  /// Holds back the TCP segments from one host to another, and drops the datagrams, until Release.
  void Stall(Address from, Address to);
  void Release(Address from, Address to);

  /// Decides for every datagram and each of its receivers whether it arrives; the link's own loss
  /// comes first. An empty function lets all pass.
  /// @param filter  must not call the network
  void SetDatagramFilter(Fabric::DatagramFilter filter);

  // ---- connections ----

  void AddFault(const StreamFault& fault);
  /// Resets every connection between the two hosts.
  void ResetConnections(Address a, Address b);
  /// Connections that at least one side has not closed.
  [[nodiscard]] std::size_t open_connections() const;

  // ---- record ----

  /// Keeps every frame that is sent from now on.
  void StartCapture();
  void StopCapture();
  [[nodiscard]] std::vector<Frame> Frames() const;
  /// The frames as text, one a line.
  [[nodiscard]] std::string FramesText() const;
  /// What one endpoint has sent to another in TCP segments, in order. Port 0: any.
  [[nodiscard]] std::string StreamBytes(const Endpoint& from, const Endpoint& to) const;

  // ---- time ----

  /// Runs `action` when the world's clock reaches `when`.
  void At(Micros when, std::function<void()> action);
  [[nodiscard]] Micros now() const { return world_.now(); }
  [[nodiscard]] World& world() const { return world_; }

  // ---- for what lives on the network ----

  /// Takes the world's lock, unless the caller holds it because the network called it.
  [[nodiscard]] World::Lock Enter() const;
  /// Lock held.
  [[nodiscard]] Fabric& fabric() const { return fabric_; }

 private:
  static Fabric& Find(World& world);

  World& world_;
  Fabric& fabric_;
};

}  // namespace sim
