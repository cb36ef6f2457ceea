// What the host's sockets of one device have in common.
#pragma once

#include <cstdint>
#include <set>

#include "net/endpoint.h"
#include "net/posix/loss.h"

namespace sim {

/// Outlives the sockets; world's lock held.
struct DeviceSockets {
  DeviceSockets(Address address, double loss_percent, std::uint64_t loss_seed)
      : own(address), loss(loss_percent, loss_seed) {}

  /// Where packets come from and where they are accepted; one host can carry several devices and a
  /// server, each on an address of its own (127.0.0.1, 127.0.0.2, ...).
  const Address own;
  DatagramLoss loss;
  /// Ports of UDP sockets. To a program 127.0.0.1 is its own device: what it sends there stays on
  /// the device when one of these has the port, and goes to the host's 127.0.0.1 otherwise.
  std::multiset<std::uint16_t> datagram_ports;
};

}  // namespace sim
