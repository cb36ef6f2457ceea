#include "mcftp/cipher/blowfish.h"

#include <gtest/gtest.h>

#include <numeric>
#include <random>

#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/openssl_blowfish.h"
#include "mcftp/golden_frames.h"
#include "support/hex.h"

namespace {

using mcftp::Blowfish;
using test::Bytes;
using test::Hex;
using test::OpenSslBlowfish;
using test::ToHex;

constexpr std::uint8_t kUntouched = 0xCD;

Bytes Counting(std::size_t count) {
  Bytes bytes(count);
  std::iota(bytes.begin(), bytes.end(), std::uint8_t{0});
  return bytes;
}

Bytes Random(std::mt19937& random, std::size_t count) {
  Bytes bytes(count);
  for (std::uint8_t& byte : bytes) byte = static_cast<std::uint8_t>(random());
  return bytes;
}

/// Enciphers from a block of exactly `clear`'s size into one of exactly the padded size.
Bytes Encipher(const Blowfish& cipher, const Bytes& clear) {
  Bytes out(Blowfish::PaddedLength(clear.size()));
  EXPECT_EQ(cipher.Encipher(clear.data(), out.data(), clear.size()), out.size());
  return out;
}

Bytes Decipher(const Blowfish& cipher, const Bytes& enciphered) {
  Bytes out(enciphered.size());
  cipher.Decipher(enciphered.data(), out.data(), enciphered.size());
  return out;
}

TEST(BlowfishTest, AgreesWithThePublishedVectors) {
  struct Vector {
    const char* key;
    std::uint32_t left, right;
    std::uint32_t enciphered_left, enciphered_right;
  };
  constexpr Vector kVectors[] = {
      {"00 00 00 00 00 00 00 00", 0, 0, 0x4EF99745, 0x6198DD78},
      {"ff ff ff ff ff ff ff ff", 0xFFFFFFFF, 0xFFFFFFFF, 0x51866FD5, 0xB85ECB8A},
      {"30 00 00 00 00 00 00 00", 0x10000000, 0x00000001, 0x7D856F9A, 0x613063F2},
      {"11 11 11 11 11 11 11 11", 0x11111111, 0x11111111, 0x2466DD87, 0x8B963C9D},
      {"01 23 45 67 89 ab cd ef", 0x11111111, 0x11111111, 0x61F9C380, 0x2281B096},
      {"11 11 11 11 11 11 11 11", 0x01234567, 0x89ABCDEF, 0x7D0CC630, 0xAFDA1EC7},
      {"fe dc ba 98 76 54 32 10", 0x01234567, 0x89ABCDEF, 0x0ACEAB0F, 0xC6A0A28D},
      {"7c a1 10 45 4a 1a 6e 57", 0x01A1D6D0, 0x39776742, 0x59C68245, 0xEB05282B},
      {"f0", 0xFEDCBA98, 0x76543210, 0xF9AD597C, 0x49DB005E},
      {"f0 e1", 0xFEDCBA98, 0x76543210, 0xE91D21C1, 0xD961A6D6},
      {"f0 e1 d2", 0xFEDCBA98, 0x76543210, 0xE9C2B70A, 0x1BC65CF3},
      {"f0 e1 d2 c3", 0xFEDCBA98, 0x76543210, 0xBE1E6394, 0x08640F05},
      {"f0 e1 d2 c3 b4 a5 96 87 78 69 5a 4b 3c 2d 1e 0f 00 11 22 33 44 55 66 77", 0xFEDCBA98,
       0x76543210, 0x05044B62, 0xFA52D080},
  };
  for (const Vector& v : kVectors) {
    const Bytes key = Hex(v.key);
    const Blowfish cipher(key.data(), key.size());
    std::uint32_t left = v.left;
    std::uint32_t right = v.right;

    cipher.EncipherBlock(left, right);
    EXPECT_EQ(left, v.enciphered_left) << "key " << v.key;
    EXPECT_EQ(right, v.enciphered_right) << "key " << v.key;
    cipher.DecipherBlock(left, right);
    EXPECT_EQ(left, v.left) << "key " << v.key;
    EXPECT_EQ(right, v.right) << "key " << v.key;
  }
}

TEST(BlowfishTest, HasTheHalvesOfABlockLittleEndianInMemory) {
  struct Vector {
    Bytes key;
    const char* clear;
    const char* enciphered;
  };
  const mcftp::FixedKey fixed;
  const Bytes fixed_key(std::begin(fixed.bytes), std::end(fixed.bytes));
  const Vector kVectors[] = {
      {Bytes(8), "00 00 00 00 00 00 00 00", "45 97 f9 4e 78 dd 98 61"},
      {Counting(32), "00 00 00 00 00 00 00 00", "7b 3b 82 0c 7e 4b 01 8d"},
      {Counting(32), "01 02 03 04", "2e 63 79 06 30 62 93 64"},
      {Counting(32), "00 01 02 03 04 05 06 07 08",
       "61 04 72 87 32 e5 cf dd 3a 5c c9 09 86 41 6c 7a"},
      {Counting(32), "00 00 00 05", "ea 85 c8 a3 b3 68 8a 1c"},
      {fixed_key, "00 00 00 00 00 00 00 00", "5f 48 a0 27 68 25 8c 6b"},
  };
  for (const Vector& v : kVectors) {
    const Blowfish cipher(v.key.data(), v.key.size());
    EXPECT_EQ(ToHex(Encipher(cipher, Hex(v.clear))), v.enciphered) << v.clear;
  }
}

TEST(BlowfishTest, AgreesWithOpenSslForRandomKeysAndLengths) {
  std::mt19937 random(20060301);
  for (int round = 0; round < 300; ++round) {
    const Bytes key = Random(random, 1 + random() % 56);
    const Bytes clear = Random(random, 8 * (1 + random() % 250));
    const Blowfish cipher(key.data(), key.size());
    const OpenSslBlowfish judge(key);

    const Bytes enciphered = Encipher(cipher, clear);
    ASSERT_EQ(enciphered, judge.Encipher(clear)) << "key " << ToHex(key);
    ASSERT_EQ(judge.Decipher(enciphered), clear);
    ASSERT_EQ(Decipher(cipher, enciphered), clear);
    ASSERT_EQ(Decipher(cipher, clear), judge.Decipher(clear));
  }
}

TEST(BlowfishTest, FillsTheLastBlockUpWithZerosWhateverStoodThere) {
  const Bytes key = Counting(32);
  const Blowfish cipher(key.data(), key.size());
  const OpenSslBlowfish judge(key);
  for (std::size_t length = 1; length <= 200; ++length) {
    const Bytes clear = Counting(length);
    Bytes padded = clear;
    padded.resize(Blowfish::PaddedLength(length), 0);
    const Bytes expected = judge.Encipher(padded);

    EXPECT_EQ(Encipher(cipher, clear), expected) << length << " bytes into another buffer";
    Bytes in_place(padded.size() + 8, kUntouched);
    std::copy(clear.begin(), clear.end(), in_place.begin());
    EXPECT_EQ(cipher.Encipher(in_place.data(), in_place.data(), length), padded.size());
    EXPECT_EQ(Bytes(in_place.begin(), in_place.end() - 8), expected) << length << " in place";
    EXPECT_EQ(Bytes(in_place.end() - 8, in_place.end()), Bytes(8, kUntouched));
  }
}

TEST(BlowfishTest, DeciphersWholeBlocksInPlaceAndIntoAnotherBuffer) {
  const Bytes key = Counting(32);
  const Blowfish cipher(key.data(), key.size());
  for (std::size_t length = 1; length <= 200; ++length) {
    Bytes padded = Counting(length);
    padded.resize(Blowfish::PaddedLength(length), 0);
    Bytes bytes = Encipher(cipher, Counting(length));
    const std::size_t behind = bytes.size();
    bytes.insert(bytes.end(), 8, kUntouched);
    Bytes out(bytes.size(), kUntouched);
    padded.insert(padded.end(), 8, kUntouched);

    cipher.Decipher(bytes.data(), out.data(), length);
    EXPECT_EQ(out, padded) << length;
    cipher.Decipher(bytes.data(), bytes.data(), length);
    EXPECT_EQ(bytes, padded) << length;
    EXPECT_EQ(bytes.size(), behind + 8);
  }
}

TEST(BlowfishTest, TakesTwoBlocksToDecipherNineBytes) {
  const Bytes key = Counting(32);
  const Blowfish cipher(key.data(), key.size());
  Bytes bytes = Encipher(cipher, Counting(9));
  ASSERT_EQ(bytes.size(), 16U);

  cipher.Decipher(bytes.data(), bytes.data(), 9);

  EXPECT_EQ(bytes, Hex("00 01 02 03 04 05 06 07 08 00 00 00 00 00 00 00"));
}

TEST(BlowfishTest, TouchesNothingForNoBytes) {
  const Bytes key = Counting(32);
  const Blowfish cipher(key.data(), key.size());
  std::uint8_t byte = kUntouched;

  EXPECT_EQ(cipher.Encipher(&byte, &byte, 0), 0U);
  cipher.Decipher(&byte, &byte, 0);
  EXPECT_EQ(byte, kUntouched);
  EXPECT_EQ(cipher.Encipher(nullptr, nullptr, 0), 0U);
  cipher.Decipher(nullptr, nullptr, 0);
}

TEST(BlowfishTest, WorksAtEveryAlignment) {
  const Bytes key = Counting(32);
  const Blowfish cipher(key.data(), key.size());
  const Bytes expected = Encipher(cipher, Counting(100));
  for (std::size_t from = 0; from < 8; ++from) {
    for (std::size_t to = 0; to < 8; ++to) {
      Bytes source(from + 100);
      std::iota(source.begin() + static_cast<std::ptrdiff_t>(from), source.end(), std::uint8_t{0});
      Bytes target(to + 104);
      cipher.Encipher(source.data() + from, target.data() + to, 100);
      EXPECT_EQ(Bytes(target.begin() + static_cast<std::ptrdiff_t>(to), target.end()), expected);
    }
  }
}

TEST(BlowfishTest, RoundsLengthsUpToWholeBlocks) {
  EXPECT_EQ(Blowfish::PaddedLength(0), 0U);
  EXPECT_EQ(Blowfish::PaddedLength(1), 8U);
  EXPECT_EQ(Blowfish::PaddedLength(8), 8U);
  EXPECT_EQ(Blowfish::PaddedLength(9), 16U);
  EXPECT_EQ(Blowfish::PaddedLength(0x80000001U), 0x80000008U);
}

TEST(BlowfishTest, CountsOnlyTheFirst72BytesOfAKey) {
  const Bytes key = Counting(80);
  const Blowfish all(key.data(), 80);
  const Blowfish counted(key.data(), 72);
  EXPECT_EQ(Encipher(all, Counting(8)), Encipher(counted, Counting(8)));
}

TEST(BlowfishTest, TakesAnEmptyKeyForAZeroByte) {
  const std::uint8_t zero = 0;
  const Blowfish none(nullptr, 0);
  const Blowfish one(&zero, 1);
  EXPECT_EQ(Encipher(none, Counting(8)), Encipher(one, Counting(8)));
}

TEST(FixedKeyTest, IsWhatEveryClientAndServerHas) {
  const mcftp::FixedKey key;
  EXPECT_EQ(ToHex(key.bytes, sizeof key.bytes),
            "51 6a 0f 20 c5 9e b3 54 69 02 27 f8 9d b6 4b 6c "
            "01 da ff 90 b5 4e 63 04 d9 f2 97 a8 4d 66 3b dc");
}

}  // namespace
