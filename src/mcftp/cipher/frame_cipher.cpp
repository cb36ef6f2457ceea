#include "mcftp/cipher/frame_cipher.h"

#include "mcftp/wire/frames.h"

namespace mcftp {

std::size_t SealFrame(const Blowfish& cipher, std::uint8_t* frame, std::size_t length,
                      std::size_t capacity) noexcept {
  if (length < kHeaderLength || EncipheredLength(length) > capacity) return 0;
  SetEncryptedFlag(frame, true);
  std::uint8_t* body = frame + kHeaderLength;
  return kHeaderLength + cipher.Encipher(body, body, length - kHeaderLength);
}

bool OpenFrame(const Blowfish& cipher, std::uint8_t* frame, std::size_t length) noexcept {
  if (length < kHeaderLength) return false;
  if ((frame[0] & kEncryptedBit >> 8) == 0) return true;
  const std::size_t body = length - kHeaderLength;
  if (body % Blowfish::kBlock != 0) return false;
  cipher.Decipher(frame + kHeaderLength, frame + kHeaderLength, body);
  return true;
}

}  // namespace mcftp
