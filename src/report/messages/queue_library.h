// The functions of the device's message-queue library, as it declares them.
#pragma once

#include <coredll.h>

#include <cstdint>

namespace report {

/// Who gets a message, or sends it: texts padded with zeros, which 16 characters fill.
struct QueueAddress {
  char name[16];
  char master[16];  ///< empty: on this device
};
static_assert(sizeof(QueueAddress) == 32, "the library's layout");

// The parameters without a name are the library's own matter: see the calls. Results are not
// looked at; whether a connection came about shows in its handle.

using LapiOpen = std::int32_t (*)(HANDLE* connection, const char* host, const char* queue,
                                  std::int32_t, std::int32_t, std::int32_t, std::int32_t,
                                  std::uint32_t* options, std::int32_t);

/// @param length  of the message, its closing zero included
using LapiWrite = std::int32_t (*)(HANDLE connection, std::int32_t, std::int32_t, std::int32_t,
                                   std::int32_t, std::int32_t, QueueAddress* destination,
                                   QueueAddress* source, const char* message, std::int32_t length,
                                   std::int32_t, std::int32_t, std::int32_t,
                                   std::uint32_t* options);

using LapiClose = std::int32_t (*)(HANDLE connection);

}  // namespace report
