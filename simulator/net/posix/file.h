// One of the host's sockets, owned.
#pragma once

#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <utility>

#include "net/endpoint.h"

namespace sim {

class SocketFile {
 public:
  explicit SocketFile(int file = -1) : file_(file) {}
  ~SocketFile() { Close(); }
  SocketFile(SocketFile&& other) noexcept : file_(std::exchange(other.file_, -1)) {}
  SocketFile& operator=(SocketFile&& other) noexcept {
    if (this != &other) {
      Close();
      file_ = std::exchange(other.file_, -1);
    }
    return *this;
  }

  [[nodiscard]] int get() const { return file_; }
  [[nodiscard]] bool open() const { return file_ >= 0; }

  // 0 or a Winsock error.
  static int Make(int type, SocketFile& file);
  int Bind(const Endpoint& local);
  int Set(int level, int option, const void* value, socklen_t size);
  int Set(int level, int option, int value) { return Set(level, option, &value, sizeof value); }
  /// As Set, for an option that helps and is not needed: an emulated host may not have it.
  int SetIfKnown(int level, int option, const void* value, socklen_t size);
  int SetIfKnown(int level, int option, int value) {
    return SetIfKnown(level, option, &value, sizeof value);
  }
  int Pending(std::uint32_t& bytes);

  [[nodiscard]] Endpoint Local() const;
  [[nodiscard]] Endpoint Peer() const;
  /// Which of `events` hold now.
  [[nodiscard]] short Poll(short events) const;

 private:
  void Close() {
    if (file_ >= 0) close(file_);
  }
  int file_;
};

}  // namespace sim
