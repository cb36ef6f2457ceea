// The server's idea of time.
#pragma once

#include <chrono>

namespace server {

/// A moment: milliseconds since an epoch of the caller's choice, never running backwards. The
/// engine reads no clock; whoever drives it says what time it is.
using Time = std::chrono::milliseconds;

/// The same where milliseconds are too coarse: a round trip in a quiet network takes a fraction of
/// one.
using Micros = std::chrono::microseconds;

}  // namespace server
