// Which device this is, as its platform tells it.
#pragma once

#include <cstdint>

namespace device {

enum class IdentityResult : std::int32_t {
  kOk = 0,
  kUnavailable = -1,  ///< the platform does not say what it is, or did not answer
  kTooSmall = -8,     ///< nothing was copied; `size` says how long the text is
};

// The readers below ask the platform once and remember its answer for the life of the process.
// `*size` is the capacity of `text` on the way in and the text's length on the way out; the text
// is copied, with its terminating zero, only when the capacity exceeds that length. On
// kUnavailable both are left alone. Any thread, several at once too.

/// The configuration text ("TQ52-A1"): type, family, model and more, at most 31 characters.
IdentityResult GetConfigurationText(char* text, int* size) noexcept;

/// The serial number, or what the network address makes of it, at most 63 characters. Empty, with
/// kOk, when the platform is known but does not answer.
IdentityResult GetSerialNumber(char* text, int* size) noexcept;

/// The configuration text's first four characters and the serial number, at most 63 characters; the
/// four characters alone, for the life of the process, when the serial number was empty at the
/// first call. Fails as those two fail when either of them is longer than 31 characters.
IdentityResult GetUniqueId(char* text, int* size) noexcept;

}  // namespace device
