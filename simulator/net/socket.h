// One socket of a device, with Winsock's rules and without blocking.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <set>
#include <string_view>

#include "net/endpoint.h"
#include "net/transport.h"

namespace sim {

/// One datagram as a program of the device sends or receives it.
struct SeenDatagram {
  bool sent = false;
  Endpoint from;
  Endpoint to;  ///< of a received one: the group, where the transport knows it, else the device
  std::string_view bytes;
};

/// Called with the world's lock held: it must be quick and call nothing of the device.
using DatagramListener = std::function<void(const SeenDatagram&)>;

/// The states, checks and error numbers of Winsock, the same in both worlds. Results are 0 or a
/// Winsock error; WSAEWOULDBLOCK also on a blocking socket, whose caller then waits on queue() and
/// tries again. World's lock held.
class Socket {
 public:
  /// @param own       the device's address; "any" means this one
  /// @param listener  may be empty; outlives the socket
  Socket(SocketKind kind, std::unique_ptr<Transport> transport, Address own,
         const DatagramListener& listener);

  [[nodiscard]] SocketKind kind() const { return kind_; }
  [[nodiscard]] bool nonblocking() const { return nonblocking_; }
  void set_nonblocking(bool on) { nonblocking_ = on; }
  [[nodiscard]] WaitQueue& queue() { return transport_->queue; }

  int Bind(const Endpoint& local);
  int Connect(const Endpoint& peer);
  /// What has become of a connect that gave WSAEWOULDBLOCK.
  int FinishConnect();
  int Listen(int backlog);
  int Accept(std::unique_ptr<Socket>& accepted, Endpoint& peer);
  int Send(const char* bytes, std::size_t size, std::size_t& sent);
  int SendTo(const Endpoint& to, const char* bytes, std::size_t size, std::size_t& sent);
  int Receive(char* bytes, std::size_t size, bool peek, Received& result);
  int Shutdown(int how);
  int Pending(std::uint32_t& bytes);
  int SetOption(int level, int option, const char* value, int size);
  int GetOption(int level, int option, char* value, int* size);
  int LocalName(Endpoint& local) const;
  int PeerName(Endpoint& peer);

  /// Which of `interest` select reports now.
  unsigned Ready(unsigned interest);
  void Watch(unsigned interest, std::vector<pollfd>& files) const;

  /// To be called once before the socket ends.
  void PrepareClose();

 private:
  struct NumberOption;

  int ReceiveDatagram(char* bytes, std::size_t size, bool peek, Received& result);
  void FollowConnect();
  int BindAny();
  int Broken(int error);
  int Group(int option, const char* value, int size);
  int SetNumber(const NumberOption& row, const char* value, int size);
  [[nodiscard]] const NumberOption* FindNumber(int level, int option) const;
  [[nodiscard]] int CheckDatagramTarget(const Endpoint& to) const;
  [[nodiscard]] bool IsOwn(Address address) const;

  static constexpr int kDefaultBuffer = 32768;

  const SocketKind kind_;
  const Address own_;
  std::unique_ptr<Transport> transport_;
  const DatagramListener& listener_;
  bool nonblocking_ = false;
  bool bound_ = false;
  bool bound_to_any_ = false;
  bool listening_ = false;
  bool connecting_ = false;
  bool connected_ = false;
  bool send_shut_ = false;
  bool receive_shut_ = false;
  int connect_error_ = 0;  ///< of a connect that failed after it began, until it is asked for
  int broken_ = 0;         ///< what ended the connection; every later call gives it again
  Endpoint peer_;
  std::set<Address> groups_;

  // Options as they were set.
  int reuse_address_ = 0;
  int keep_alive_ = 0;
  int broadcast_ = 0;
  int send_buffer_ = kDefaultBuffer;
  int receive_buffer_ = kDefaultBuffer;
  int no_delay_ = 0;
  int multicast_ttl_ = 1;
  int multicast_loop_ = 1;
  ce_linger linger_{};
};

}  // namespace sim
