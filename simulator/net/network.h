// A device's sockets.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "ce/winsock.h"
#include "net/endpoint.h"
#include "net/posix/device_sockets.h"
#include "net/socket.h"
#include "world/world.h"

namespace sim {

class Device;

/// What Winsock keeps for one thread: texts that a call returns by pointer stay until the thread's
/// next call of that function.
struct ThreadTexts {
  char dotted[16] = {};  ///< inet_ntoa
  std::string host_name;
  std::uint32_t host_address = 0;  ///< network order
  char* aliases[1] = {};
  char* addresses[2] = {};
  ce_hostent host{};
};

class Network {
 public:
  explicit Network(Device& device);
  /// Closes the sockets that are left.
  ~Network();
  Network(const Network&) = delete;
  Network& operator=(const Network&) = delete;

  // ---- for tests and tools; any thread, lock not held ----

  /// The next `calls` calls of send find the send buffer full: they give WSAEWOULDBLOCK.
  void FillSendBuffer(std::uint64_t calls);
  /// Sockets that the device has not closed.
  [[nodiscard]] std::size_t open_sockets() const;
  /// Shows every datagram that the device's programs send and receive from now on; an empty
  /// function ends it.
  void ListenToDatagrams(DatagramListener listener);
  /// Datagrams that were sent to the device and that its profile let be lost.
  [[nodiscard]] std::uint64_t datagrams_lost() const;
  /// The device's own address, from its profile.
  [[nodiscard]] Address address() const { return own_; }

  // ---- for the API's functions; lock held ----

  /// @return how often WSAStartup is still to be matched by WSACleanup.
  [[nodiscard]] unsigned started() const { return started_; }
  void StartUp() { ++started_; }
  /// Closes all sockets at the last call.
  void CleanUp();

  /// 0, or a Winsock error. Numbers of closed sockets are not used again.
  int Open(SocketKind kind, SOCKET& number);
  SOCKET Add(std::unique_ptr<Socket> socket);
  [[nodiscard]] Socket* Find(SOCKET number) const;
  /// Wakes whoever waits on the socket. @return false for an unknown number.
  bool Close(SOCKET number);

  struct Watched {
    SOCKET number = 0;
    unsigned interest = 0;
  };
  /// Waits until one of the sockets may be ready. All of them must be open.
  void Wait(World::Lock& lock, const std::vector<Watched>& sockets, std::optional<Micros> deadline);
  /// A call that found nothing costs a virtual world's smallest piece of time; otherwise a program
  /// that asks again and again would hold the clock still for ever.
  void LetTimePass(World::Lock& lock);

  /// Runs `operation` on the socket until it no longer says WSAEWOULDBLOCK; a non-blocking socket
  /// is asked once. @return the operation's result, WSAENOTSOCK for an unknown number, WSAEINTR
  /// when the socket was closed meanwhile.
  template <typename Operation>
  int Run(World::Lock& lock, SOCKET number, unsigned interest, Operation operation) {
    Socket* socket = Find(number);
    if (socket == nullptr) return WSAENOTSOCK;
    for (;;) {
      const int error = operation(*socket);
      if (error != WSAEWOULDBLOCK) return error;
      if (socket->nonblocking()) {
        LetTimePass(lock);
        return error;
      }
      Wait(lock, {{number, interest}}, std::nullopt);
      socket = Find(number);
      if (socket == nullptr) return WSAEINTR;
    }
  }

  /// The address of a host by name. No question leaves the machine: known are the device itself,
  /// "localhost" and, in a virtual world, the names given to its network.
  [[nodiscard]] std::optional<Address> Resolve(std::string_view name) const;
  ThreadTexts& texts(std::uint32_t thread) { return texts_[thread]; }

 private:
  Device& device_;
  const Address own_;
  unsigned started_ = 0;
  DeviceSockets host_sockets_;
  DatagramListener listener_;
  SOCKET next_number_ = 0x100;
  std::map<SOCKET, std::unique_ptr<Socket>> sockets_;
  std::map<std::uint32_t, ThreadTexts> texts_;
};

}  // namespace sim
