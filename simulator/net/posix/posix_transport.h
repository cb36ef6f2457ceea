// Sockets of the real world: the host's own, tied to the device's address.
#pragma once

#include <memory>

#include "net/endpoint.h"
#include "net/transport.h"

namespace sim {

/// @param own  where the device's packets come from and where they are accepted; one host can
///   carry several devices and a server, each on an address of its own (127.0.0.1, 127.0.0.2, ...)
/// @return 0 or a Winsock error
int MakePosixTransport(SocketKind kind, Address own, std::unique_ptr<Transport>& transport);

}  // namespace sim
