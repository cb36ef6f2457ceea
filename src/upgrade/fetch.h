// Fetching one file from the job's server.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "base/text.h"
#include "upgrade/run.h"

namespace upgrade {

/// What a server that cannot be made to give the file means.
enum class OnFailedGet : std::uint8_t {
  kTryAgain,    ///< asked again every three seconds, without an end
  kTakeAsDone,  ///< counts as success, so that one missing file does not hold up the others
};

/// Fetches `source` into `destination`, making the folder it goes to.
// KEPT ODDITY: there is no limit on attempts. A server that cannot be reached is tried for ever,
// whatever `failed_get` says; each attempt has a connection of its own.
///
/// @param source       path on the server, with or without a slash in front
/// @param destination  path on the device, at most 259 characters
/// @return false only when there is no memory for the attempt.
bool FetchFile(Run& run, const char* source, const char* destination,
               OnFailedGet failed_get) noexcept;

/// Room for base URL, source and the two numbers behind it.
inline constexpr std::size_t kNarrowUrlSize = 640;

/// The URL of a file. A base URL that names a port itself (a colon behind its first eight
/// characters) is followed by the source as it stands. Otherwise the port is added, and
/// ":ATTEMPT,TOTAL" behind the source, for the server's display.
[[nodiscard]] base::FixedText<kNarrowUrlSize> FileUrl(std::string_view base_url, int port,
                                                      std::string_view source,
                                                      std::uint32_t attempt,
                                                      std::uint32_t total) noexcept;

}  // namespace upgrade
