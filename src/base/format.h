// The one bounded printf-style formatter.
#pragma once

#include <cstdarg>
#include <cstddef>

namespace base {

/// Formats into `out`, which is always terminated and never overrun (a capacity of 0 writes
/// nothing).
///
/// Knows %d %i %u %x %X %c %s and %%, the flags '0' and '-', a width and, for %s, a precision,
/// each as digits or '*'. Every number argument is 32 bits wide ("%lu" is "%u": `long` has 32 bits
/// on the device); a null text prints nothing. An unknown conversion is copied as it stands.
/// Arguments wider than 32 bits must not be passed.
/// @return characters in `out`, without the terminating zero.
std::size_t FormatV(char* out, std::size_t capacity, const char* format,
                    va_list arguments) noexcept;

[[gnu::format(printf, 3, 4)]] std::size_t Format(char* out, std::size_t capacity,
                                                 const char* format, ...) noexcept;

}  // namespace base
