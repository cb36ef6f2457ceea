// The one way into the multicast client.
#pragma once

#include <cstdint>

#include "mcftp/owner.h"

namespace mcftp {

/// Runs one multicast client from its command line to its end: receives the files that a server
/// announces until the last one, or until none has been announced for five minutes.
///
/// Blocks; looks every 250 ms whether the client has stopped. Any number of clients may run at the
/// same time. Starts Windows Sockets itself.
///
/// @param command_line  options as "-A=239.1.1.1 -P=7000 -UA=127.0.0.1 -UP=5655 -HV=TQ52": public
///   group and port, local user interface, remote debug (DA, DP), the device's MCT. Blanks, "/" and
///   "-" separate them.
/// @param owner  who wants to know more; null for nobody. Its `stopped` is called before this
///   returns, if the client's thread ever ran.
/// @return 0 when a client ran and stopped; -1 when the command line is null, empty or malformed,
///   there is no memory for a client, or it could not start.
[[nodiscard]] std::int32_t StartMulticastClient(const char* command_line,
                                                const ClientOwner* owner = nullptr) noexcept;

}  // namespace mcftp
