// What a cipher knows before it has a key.
#pragma once

#include "mcftp/cipher/blowfish.h"

namespace mcftp {

/// The hexadecimal digits of pi behind the point, 32 bits a word.
extern const Blowfish::Schedule kPiSchedule;

}  // namespace mcftp
