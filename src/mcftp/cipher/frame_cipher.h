// Enciphering whole frames: the header stays in the clear, everything behind it does not.
#pragma once

#include <cstddef>
#include <cstdint>

#include "mcftp/cipher/blowfish.h"

namespace mcftp {

/// Bytes that a frame of `length` bytes takes once enciphered: an ACK of 6 makes 10.
[[nodiscard]] constexpr std::size_t EncipheredLength(std::size_t length) noexcept {
  return length < 2 ? length : 2 + Blowfish::PaddedLength(length - 2);
}

/// Makes an encoded frame ready to send: reserved bits cleared, encrypted flag set, the bytes
/// behind the header enciphered in place.
/// @param capacity  of `frame`; EncipheredLength(length) bytes are needed
/// @return the datagram's length; 0, with the frame untouched, when it does not fit or has no
///   header
std::size_t SealFrame(const Blowfish& cipher, std::uint8_t* frame, std::size_t length,
                      std::size_t capacity) noexcept;

/// Deciphers a received frame in place when its encrypted flag is set; a clear one stays as it is.
/// The flag stays set.
/// @return false when the frame is to be dropped: it has no header, or a body that is enciphered
///   and no multiple of whole blocks.
[[nodiscard]] bool OpenFrame(const Blowfish& cipher, std::uint8_t* frame,
                             std::size_t length) noexcept;

}  // namespace mcftp
