// The host's socket addresses.
#pragma once

#include <netinet/in.h>
#include <sys/socket.h>

#include "net/endpoint.h"

namespace sim {

class HostAddress {
 public:
  HostAddress() = default;
  explicit HostAddress(const Endpoint& endpoint) {
    address_.sin_family = AF_INET;
    address_.sin_port = SwapOrder(endpoint.port);
    address_.sin_addr.s_addr = SwapOrder(endpoint.address);
  }

  [[nodiscard]] sockaddr* get() { return reinterpret_cast<sockaddr*>(&address_); }
  [[nodiscard]] const sockaddr* get() const { return reinterpret_cast<const sockaddr*>(&address_); }
  [[nodiscard]] socklen_t size() const { return size_; }
  [[nodiscard]] socklen_t* room() { return &size_; }
  [[nodiscard]] Endpoint endpoint() const {
    return {SwapOrder(address_.sin_addr.s_addr), SwapOrder(address_.sin_port)};
  }

 private:
  sockaddr_in address_{};
  socklen_t size_ = sizeof(sockaddr_in);
};

}  // namespace sim
