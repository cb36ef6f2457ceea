// What a socket's bytes travel on: the host's sockets in the real world, an in-process network in
// the virtual one.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "net/endpoint.h"
#include "world/world.h"

struct pollfd;

namespace sim {

/// What a caller of select waits for.
enum Interest : unsigned { kReadable = 1, kWritable = 2, kExceptional = 4 };

enum class SocketKind : std::uint8_t { kStream, kDatagram };

struct Received {
  std::size_t size = 0;  ///< bytes written to the caller's buffer
  bool cut = false;      ///< the datagram was longer than the buffer
  Endpoint from;
  Address group = kAnyAddress;  ///< that it was sent to, where the transport knows it
};

/// Numbers a socket tells its transport.
enum class Tuning : std::uint8_t {
  kNoDelay,
  kKeepAlive,
  kBroadcast,
  kReuseAddress,
  kSendBuffer,     ///< bytes
  kReceiveBuffer,  ///< bytes
  kMulticastTtl,
  kMulticastLoop,
};

/// One socket's way to its peers. The socket above it (net/socket.h) has checked the arguments and
/// keeps Winsock's rules; a transport only moves bytes. Results are 0 or a Winsock error. Nothing
/// blocks: WSAEWOULDBLOCK says that the call would have to wait. World's lock held for all of it.
class Transport {
 public:
  Transport() = default;
  /// Closes it. Bytes that were accepted still reach the peer, unless Abort was called.
  virtual ~Transport() = default;
  Transport(const Transport&) = delete;
  Transport& operator=(const Transport&) = delete;

  /// @param local  address 0: the device's own; port 0: any that is free
  virtual int Bind(const Endpoint& local) = 0;
  /// WSAEWOULDBLOCK: under way, ask ConnectResult.
  virtual int Connect(const Endpoint& peer) = 0;
  virtual int ConnectResult() = 0;
  virtual int Listen(int backlog) = 0;
  virtual int Accept(std::unique_ptr<Transport>& accepted) = 0;
  virtual int Send(const char* bytes, std::size_t size, std::size_t& sent) = 0;
  virtual int SendTo(const Endpoint& to, const char* bytes, std::size_t size) = 0;
  virtual int Receive(char* bytes, std::size_t size, bool peek, Received& result) = 0;
  virtual int ShutdownSend() = 0;
  /// Bytes that one receive would give now.
  virtual int Pending(std::uint32_t& bytes) = 0;
  virtual int Join(Address group) = 0;
  virtual int Leave(Address group) = 0;
  virtual int Tune(Tuning what, int value) = 0;

  /// Which of `interest` would not block now.
  virtual unsigned Ready(unsigned interest) = 0;
  /// Adds the host's files whose events may change Ready; none when `queue` tells of all changes.
  virtual void Watch(unsigned interest, std::vector<pollfd>& files) const = 0;

  [[nodiscard]] virtual Endpoint local() const = 0;
  [[nodiscard]] virtual Endpoint peer() const = 0;

  /// Makes closing drop what is under way and reset the connection.
  virtual void Abort() = 0;

  /// Notified when Ready may have changed, and when the socket is closed.
  WaitQueue queue;
};

}  // namespace sim
