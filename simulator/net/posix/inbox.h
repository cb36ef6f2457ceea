// Datagrams that one of the host's sockets has received.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <ctime>
#include <memory>
#include <utility>

#include "net/endpoint.h"
#include "net/posix/file.h"

namespace sim {

/// One of them.
struct Letter {
  Endpoint from;
  const char* bytes = nullptr;
  std::size_t size = 0;
  std::pair<std::time_t, long> when;  ///< by the host's clock
  bool heard = false;                 ///< has been found not to be lost on its way
};

/// A host's socket, and what was taken from it. Where many devices share few processors, a device
/// that gets its turn finds several datagrams: they are taken by one call to the host, and the
/// program, which looks, asks for the size and takes each of them, is answered from here.
class Inbox {
 public:
  Inbox() = default;
  explicit Inbox(SocketFile file, Address group = kAnyAddress)
      : file_(std::move(file)), group_(group) {}

  [[nodiscard]] SocketFile& file() { return file_; }
  [[nodiscard]] const SocketFile& file() const { return file_; }
  /// That it has joined; 0: it hears the device's own address.
  [[nodiscard]] Address group() const { return group_; }

  [[nodiscard]] bool empty() const { return next_ == count_; }
  /// Of the line that waits here; it must not be empty.
  [[nodiscard]] Letter& front() { return letters_[next_]; }
  void Pop() { ++next_; }
  /// Whether the host had more when the line was filled.
  [[nodiscard]] bool was_full() const { return count_ == kMost; }
  /// A look at the host's files begins, the `round`th.
  void Clear(std::uint64_t round) {
    next_ = count_ = 0;
    round_ = round;
  }
  [[nodiscard]] std::uint64_t round() const { return round_; }
  /// Takes what the host has, as much as there is room for. The line must be empty.
  /// @return 0 or a Winsock error, WSAEWOULDBLOCK when there is nothing
  int Fill();

 private:
  static constexpr std::size_t kMost = 16;
  static constexpr std::size_t kRoom = 65536;  ///< bytes; no datagram is longer

  SocketFile file_;
  Address group_ = kAnyAddress;
  std::unique_ptr<char[]> bytes_;  ///< once there was something to take
  std::array<Letter, kMost> letters_;
  std::size_t next_ = 0;
  std::size_t count_ = 0;
  std::uint64_t round_ = 0;
};

}  // namespace sim
