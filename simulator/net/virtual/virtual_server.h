// Programs without a thread on the hosts of a virtual network: servers for the devices to talk to.
//
//   class Echo : public sim::StreamProgram {
//     void OnBytes(sim::StreamEnd& end, std::string_view bytes) override { end.Send(bytes); }
//     void OnEnd(sim::StreamEnd& end) override { end.Close(); }
//   };
//   sim::VirtualServer server(world, {kServer, 7}, [](const sim::Endpoint&) {
//     return std::make_unique<Echo>();
//   });
//
// An engine that takes bytes and moments and gives bytes and deadlines fits behind StreamProgram:
// Send gives what found room, OnRoom says when there is more, SetTimer takes the deadline.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>

#include "net/endpoint.h"
#include "net/virtual/tcp.h"
#include "net/virtual/virtual_network.h"
#include "world/world.h"

namespace sim {

class StreamEnd;

/// What a program does with one TCP connection. Called by the network, one call at a time, with the
/// world's lock held: no simulated API may be called, StreamEnd and VirtualNetwork may.
class StreamProgram {
 public:
  virtual ~StreamProgram() = default;
  /// The connection stands.
  virtual void OnOpen(StreamEnd& /*end*/) {}
  virtual void OnBytes(StreamEnd& end, std::string_view bytes) = 0;
  /// The send buffer, which was full, has room again.
  virtual void OnRoom(StreamEnd& /*end*/) {}
  /// The peer has ended its stream. Without more ado the connection stays half open.
  virtual void OnEnd(StreamEnd& /*end*/) {}
  /// The connection is gone, or could not be made. The last call.
  virtual void OnBroken(StreamEnd& /*end*/, int /*winsock_error*/) {}
  /// The time of SetTimer has come.
  virtual void OnTime(StreamEnd& /*end*/) {}
};

/// The program's end of its connection. May be used in the program's calls and in actions of
/// VirtualNetwork::At, until Close or OnBroken.
class StreamEnd : private TcpObserver {
 public:
  StreamEnd(VirtualNetwork network, std::unique_ptr<StreamProgram> program);
  ~StreamEnd() override;
  StreamEnd(const StreamEnd&) = delete;
  StreamEnd& operator=(const StreamEnd&) = delete;

  /// Bytes of one call leave as segments of their own as long as the receiver has room.
  /// @return how many found room in the send buffer; OnRoom follows when it is not all
  std::size_t Send(std::string_view bytes);
  /// Ends the own stream when all bytes are out.
  void ShutdownSend();
  /// Ends the connection: what was sent still arrives; the peer's further bytes are answered with a
  /// reset.
  void Close();
  void Reset();
  /// While paused nothing is taken from the receive buffer, so that the peer runs into its limit.
  void SetPaused(bool paused);

  /// Calls OnTime at `when`, in place of the time set before.
  void SetTimer(Micros when);
  void StopTimer();

  [[nodiscard]] bool closed() const { return closed_; }
  [[nodiscard]] Micros now() const { return network_.now(); }
  [[nodiscard]] VirtualNetwork& network() { return network_; }
  [[nodiscard]] const Endpoint& local() const { return connection_->endpoint(side_); }
  [[nodiscard]] const Endpoint& peer() const { return connection_->endpoint(1 - side_); }

  // For those who make the connection.
  void Accept(std::shared_ptr<TcpConnection> connection, std::function<void()> ended);
  void Connect(const Endpoint& local, const Endpoint& peer, std::function<void()> ended);

 private:
  void Changed() override;
  void TakeBytes();
  void Finish();

  VirtualNetwork network_;
  std::unique_ptr<StreamProgram> program_;
  std::shared_ptr<TcpConnection> connection_;
  TcpConnection::Side side_ = 0;
  std::function<void()> ended_;
  bool open_ = false;
  bool closed_ = false;
  bool paused_ = false;
  bool wants_room_ = false;
  bool end_told_ = false;
  bool changing_ = false;
  std::uint64_t timer_ = 0;
};

/// Accepts every connection to one port of a host, which it adds to the network. Its end resets the
/// connections that are left; it must end before the world does.
class VirtualServer : private TcpListener {
 public:
  using Factory = std::function<std::unique_ptr<StreamProgram>(const Endpoint& peer)>;

  VirtualServer(World& world, const Endpoint& local, Factory factory);
  ~VirtualServer() override;
  VirtualServer(const VirtualServer&) = delete;
  VirtualServer& operator=(const VirtualServer&) = delete;

  /// From now on new connections are refused; the open ones go on.
  void StopAccepting();
  void StartAccepting();
  [[nodiscard]] std::size_t open_connections() const;
  [[nodiscard]] std::uint64_t accepted() const;

 private:
  struct Ends;

  [[nodiscard]] bool full() const override { return false; }
  void Arrived(std::shared_ptr<TcpConnection> connection) override;

  VirtualNetwork network_;
  Endpoint local_;
  Factory factory_;
  bool accepting_ = false;
  std::shared_ptr<Ends> ends_;
};

/// One connection from a host of the network to a device's port.
class VirtualClient {
 public:
  VirtualClient(World& world, Address local, const Endpoint& peer,
                std::unique_ptr<StreamProgram> program);
  ~VirtualClient();
  VirtualClient(const VirtualClient&) = delete;
  VirtualClient& operator=(const VirtualClient&) = delete;

  [[nodiscard]] StreamEnd& end() { return *end_; }

 private:
  VirtualNetwork network_;
  Endpoint local_;
  std::unique_ptr<StreamEnd> end_;
};

/// A UDP port of a host without a thread.
class VirtualPort : private DatagramSink {
 public:
  /// Called by the network, with the world's lock held; see StreamProgram.
  using OnDatagram =
      std::function<void(VirtualPort& port, const Endpoint& from, std::string_view bytes)>;

  /// @param local  port 0: any that is free
  VirtualPort(World& world, const Endpoint& local, OnDatagram on_datagram);
  ~VirtualPort() override;
  VirtualPort(const VirtualPort&) = delete;
  VirtualPort& operator=(const VirtualPort&) = delete;

  void Send(const Endpoint& to, std::string_view bytes);
  void Join(Address group);
  void Leave(Address group);
  [[nodiscard]] const Endpoint& local() const { return local_; }
  [[nodiscard]] VirtualNetwork& network() { return network_; }

 private:
  void Arrived(const Endpoint& from, const Payload& bytes) override;

  VirtualNetwork network_;
  Endpoint local_;
  OnDatagram on_datagram_;
};

}  // namespace sim
