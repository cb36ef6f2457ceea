// Blowfish of OpenSSL, whose halves are big-endian: the judge that nobody here wrote.
#pragma once

#include <openssl/evp.h>
#include <openssl/provider.h>

#include <algorithm>
#include <memory>
#include <stdexcept>

#include "support/hex.h"

namespace test {

/// Turns both halves of every block around: from this protocol's order to the usual one, or back.
inline void TurnHalves(Bytes& bytes) {
  for (std::size_t half = 0; half + 4 <= bytes.size(); half += 4) {
    std::reverse(bytes.begin() + static_cast<std::ptrdiff_t>(half),
                 bytes.begin() + static_cast<std::ptrdiff_t>(half + 4));
  }
}

/// The cipher with whole blocks of 8 bytes, in this protocol's byte order.
class OpenSslBlowfish {
 public:
  explicit OpenSslBlowfish(const Bytes& key)
      : legacy_(OSSL_PROVIDER_load(nullptr, "legacy"), OSSL_PROVIDER_unload), key_(key) {
    if (legacy_ == nullptr) throw std::runtime_error("OpenSSL has no legacy ciphers here");
  }

  [[nodiscard]] Bytes Encipher(const Bytes& bytes) const { return Run(bytes, 1); }
  [[nodiscard]] Bytes Decipher(const Bytes& bytes) const { return Run(bytes, 0); }

 private:
  [[nodiscard]] Bytes Run(Bytes bytes, int encipher) const {
    const std::unique_ptr<EVP_CIPHER_CTX, decltype(&EVP_CIPHER_CTX_free)> context(
        EVP_CIPHER_CTX_new(), EVP_CIPHER_CTX_free);
    TurnHalves(bytes);
    Bytes out(bytes.size() + 8);
    int length = 0;
    const bool done =
        EVP_CipherInit_ex(context.get(), EVP_bf_ecb(), nullptr, nullptr, nullptr, encipher) == 1 &&
        EVP_CIPHER_CTX_set_key_length(context.get(), static_cast<int>(key_.size())) == 1 &&
        EVP_CIPHER_CTX_set_padding(context.get(), 0) == 1 &&
        EVP_CipherInit_ex(context.get(), nullptr, nullptr, key_.data(), nullptr, encipher) == 1 &&
        EVP_CipherUpdate(context.get(), out.data(), &length, bytes.data(),
                         static_cast<int>(bytes.size())) == 1;
    if (!done || static_cast<std::size_t>(length) != bytes.size()) {
      throw std::runtime_error("OpenSSL's Blowfish failed");
    }
    out.resize(bytes.size());
    TurnHalves(out);
    return out;
  }

  std::unique_ptr<OSSL_PROVIDER, decltype(&OSSL_PROVIDER_unload)> legacy_;
  Bytes key_;
};

}  // namespace test
