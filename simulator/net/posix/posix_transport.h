// Sockets of the real world: the host's own, tied to the device's address.
#pragma once

#include <memory>

#include "net/transport.h"

namespace sim {

struct DeviceSockets;

/// @return 0 or a Winsock error
int MakePosixTransport(SocketKind kind, DeviceSockets& device,
                       std::unique_ptr<Transport>& transport);

}  // namespace sim
