// The network of a virtual world: its hosts, what is open on them, and the links between.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "net/endpoint.h"
#include "net/transport.h"
#include "net/virtual/frame.h"
#include "net/virtual/link.h"
#include "world/world.h"

namespace sim {

class TcpConnection;

/// The bytes of a datagram, which all its receivers share.
using Payload = std::shared_ptr<const std::string>;

/// What has a UDP port open. Called from the world's actions, with its lock held.
class DatagramSink {
 public:
  virtual ~DatagramSink() = default;
  virtual void Arrived(const Endpoint& from, const Payload& bytes) = 0;
};

/// What waits for TCP connections.
class TcpListener {
 public:
  virtual ~TcpListener() = default;
  [[nodiscard]] virtual bool full() const = 0;
  /// The connection's accepting end is the listener's from here on.
  virtual void Arrived(std::shared_ptr<TcpConnection> connection) = 0;
};

enum class HostState : std::uint8_t {
  kUp,
  kSilent,       ///< takes nothing and answers nothing, as an address without a host
  kUnreachable,  ///< its network says that there is no way to it
};

enum class StreamFaultKind : std::uint8_t {
  kReset,  ///< both ends lose the connection
  kEnd,    ///< the receiver finds the stream ended; what the sender says from then on is lost
  kStall,  ///< nothing more moves in this direction, for `stall` or for ever
};

/// What happens to a TCP connection when `after_bytes` of one direction have been sent.
struct StreamFault {
  Address from = kAnyAddress;  ///< sender of the bytes; 0: any
  Address to = kAnyAddress;
  std::uint64_t after_bytes = 0;
  StreamFaultKind kind = StreamFaultKind::kReset;
  Micros stall{0};        ///< 0: for ever
  std::uint64_t nth = 1;  ///< of the connections made from now on that match, from 1
};

/// World's lock held for all of it. Tests and servers use net/virtual/virtual_network.h.
class Fabric {
 public:
  using DatagramFilter = std::function<bool(const Frame& frame, Address receiver)>;

  explicit Fabric(World& world);
  ~Fabric();
  Fabric(const Fabric&) = delete;
  Fabric& operator=(const Fabric&) = delete;

  [[nodiscard]] World& world() const { return world_; }

  // ---- hosts ----
  void AddHost(Address address) { hosts_[address]; }
  void SetState(Address address, HostState state) { hosts_[address].state = state; }
  /// kSilent for an address without a host.
  [[nodiscard]] HostState State(Address address) const;
  void AddName(std::string_view name, Address address);
  [[nodiscard]] std::optional<Address> FindName(std::string_view name) const;
  std::unique_ptr<Transport> NewTransport(SocketKind kind, Address own);
  /// Where "127.0.0.1" leads from `from`: to itself, unless a host has that very address.
  [[nodiscard]] Address Route(Address from, Address to) const;

  // ---- links ----
  void SetDefaultLink(const LinkProfile& profile);
  Link& Between(Address from, Address to);
  void SetLink(Address from, Address to, const LinkProfile& profile);
  void Release(Address from, Address to);

  // ---- UDP ----
  /// Fills in the port when it is 0. 0 or a Winsock error.
  int BindDatagram(Endpoint& local, DatagramSink& sink, bool share);
  void UnbindDatagram(const Endpoint& local, DatagramSink& sink);
  void Join(const Endpoint& local, DatagramSink& sink, Address group);
  void Leave(const Endpoint& local, DatagramSink& sink, Address group);
  struct SendOptions {
    bool loop = true;  ///< the sender's own host hears what it sends to a group
    int ttl = 1;       ///< 0: a group's datagram does not leave the host
  };
  void SendDatagram(const Endpoint& from, const Endpoint& to, std::string_view bytes,
                    const SendOptions& options);
  void SetFilter(DatagramFilter filter) { filter_ = std::move(filter); }

  // ---- TCP ----
  int BindStream(Endpoint& local);
  void UnbindStream(const Endpoint& local);
  int Listen(const Endpoint& local, TcpListener& listener);
  void StopListening(const Endpoint& local);
  [[nodiscard]] TcpListener* FindListener(const Endpoint& local);
  void AddFault(const StreamFault& fault) { faults_.push_back(fault); }
  /// The fault that befalls a new connection's bytes from one host to another.
  std::optional<StreamFault> TakeFault(Address from, Address to);
  void Enlist(const std::shared_ptr<TcpConnection>& connection);
  /// The connections that are open now.
  std::vector<std::shared_ptr<TcpConnection>> Connections();

  // ---- time and record ----
  /// As World::At; VirtualNetwork may be used in `action`.
  std::uint64_t At(Micros when, std::function<void()> action);
  void SetCapturing(bool on) { capturing_ = on; }
  [[nodiscard]] bool capturing() const { return capturing_; }
  void Record(Frame frame) { frames_.push_back(std::move(frame)); }
  [[nodiscard]] const std::vector<Frame>& frames() const { return frames_; }

  /// True in an action of this network, where the world's lock is held.
  static bool inside();

 private:
  struct BoundSink {
    DatagramSink* sink;
    bool shares;
    std::set<Address> groups;
  };
  struct Host {
    HostState state = HostState::kUp;
    std::map<std::uint16_t, std::vector<BoundSink>> datagram_ports;
    std::set<std::uint16_t> stream_ports;
    std::map<std::uint16_t, TcpListener*> listeners;
    std::uint16_t next_port = 1025;
  };

  /// A copy of a datagram, for one host.
  struct Copy {
    Micros when;
    Host* receiver;
  };

  template <typename InUse>
  static bool ChoosePort(Host& host, std::uint16_t& port, InUse in_use);
  static BoundSink* FindSink(Host& host, std::uint16_t port, const DatagramSink& sink);
  void FindReceivers(const Endpoint& from, const Endpoint& to, const SendOptions& options);
  /// Decides what becomes of a datagram on its way to one host.
  void Forward(Frame& frame, Address receiver, Host& host);
  /// Puts the copies on their way.
  void Dispatch(const Frame& frame);
  void Deliver(Host& receiver, const Endpoint& from, const Endpoint& to, const Payload& bytes);

  World& world_;
  std::map<Address, Host> hosts_;
  std::map<std::string, Address, std::less<>> names_;
  LinkProfile default_link_;
  std::unordered_map<std::uint64_t, std::unique_ptr<Link>> links_;  ///< by Way()
  std::set<std::uint64_t> special_links_;  ///< that keep the profile they were given
  std::vector<StreamFault> faults_;
  std::vector<std::weak_ptr<TcpConnection>> connections_;
  DatagramFilter filter_;
  bool capturing_ = false;
  std::vector<Frame> frames_;

  // Of the datagram that is being sent or delivered; kept because their memory is used again.
  std::vector<std::pair<Address, Host*>> receivers_;
  std::vector<Copy> copies_;
  std::vector<Micros> arrivals_;
  std::vector<DatagramSink*> asked_;
};

}  // namespace sim
