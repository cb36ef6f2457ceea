// The texts that the protocol brings along: what its error codes mean, and the words it has taken
// over from trivial file transfer.
#pragma once

#include <cstddef>
#include <cstdint>

namespace mcftp {

/// The messages of the error codes, by code.
inline constexpr char kErrorTexts[9][64] = {
    "Undefined",
    "File not found",
    "Access violation",
    "Disk full or allocation exceeded",
    "Illegal operation",
    "Unknown transfer ID",
    "File already exists",
    "No such user",
    "Transfer should be terminated due to option negotiation",
};

/// The message of an error code (kOverrunCode brings its own); "Undefined" for a code outside the
/// table, which never indexes it.
[[nodiscard]] constexpr const char* ErrorText(std::uint16_t code) noexcept {
  constexpr std::size_t kCodes = sizeof(kErrorTexts) / sizeof(kErrorTexts[0]);
  return kErrorTexts[code < kCodes ? code : 0];
}

/// KEPT ODDITY: transfer modes and names of options that no frame carries; the binary frames have
/// fixed fields instead.
inline constexpr char kVocabulary[9][16] = {
    "netascii", "octet",     "mail",      "blksize",    "tsize",
    "timeout",  "multicast", "timestamp", "attributes",
};

}  // namespace mcftp
