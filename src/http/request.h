// The two messages that the device sends to the upgrade server.
#pragma once

#include <cstddef>
#include <cstdint>

namespace http {

/// What the device tells the server about itself. Null texts count as empty.
struct Identity {
  const char* type;
  const char* family;
  const char* model;
  const char* serial_number;
  const char* core_name;  ///< the device's unique id
};

/// The job's counters as they stand when the message is made; printed as signed numbers.
struct Counters {
  std::uint32_t bundle_rx;
  std::uint32_t http_fallback;
};

/// Writes the request for one file into `out`, cut to `capacity` - 1 characters.
/// @param path  without a leading slash
/// @param host  the server, as HostText shows it
/// @return its length in bytes.
std::size_t FormatRequest(char* out, std::size_t capacity, const char* path, const char* host,
                          const Identity& identity, const Counters& counters) noexcept;

/// Writes the report of a finished transfer.
/// @param error_text  gives the "Error:" line as it stands; null or empty gives none
/// @return its length in bytes.
std::size_t FormatReport(char* out, std::size_t capacity, const char* core_name,
                         const Counters& counters, const char* error_text) noexcept;

}  // namespace http
