#include "base/crc32.h"

#include <gtest/gtest.h>
#include <zlib.h>

#include <algorithm>
#include <cstdint>
#include <random>
#include <vector>

namespace {

std::vector<std::uint8_t> Noise(std::size_t size) {
  std::mt19937 random(20060301);
  std::vector<std::uint8_t> bytes(size);
  for (std::uint8_t& byte : bytes) byte = static_cast<std::uint8_t>(random());
  return bytes;
}

std::uint32_t Zlib(const std::uint8_t* bytes, std::size_t size) {
  return static_cast<std::uint32_t>(crc32(0, bytes, static_cast<uInt>(size)));
}

std::uint32_t Ours(const std::uint8_t* bytes, std::size_t size) {
  base::Crc32 crc;
  crc.Update(bytes, size);
  return crc.value();
}

TEST(Crc32Test, KnowsThePublishedCheckValue) {
  const char digits[] = "123456789";

  base::Crc32 crc;
  crc.Update(digits, 9);

  EXPECT_EQ(crc.value(), 0xCBF43926U);
}

TEST(Crc32Test, IsZeroOfNothing) {
  base::Crc32 crc;
  EXPECT_EQ(crc.value(), 0U);

  crc.Update(nullptr, 0);

  EXPECT_EQ(crc.value(), 0U);
}

TEST(Crc32Test, AgreesWithZlibForEveryLengthAndAlignment) {
  // Every length up to beyond the first that is folded, at every place within two words.
  const std::vector<std::uint8_t> noise = Noise(2600 + 8);
  for (std::size_t start = 0; start < 8; ++start) {
    for (std::size_t size = 0; size <= 2600; ++size) {
      ASSERT_EQ(Ours(noise.data() + start, size), Zlib(noise.data() + start, size))
          << size << " bytes from " << start;
    }
  }
}

TEST(Crc32Test, AgreesWithZlibAcrossTheChunksOfFolding) {
  // 1,200 bytes of reach and chunks of 1,448: lengths on both sides of every boundary up to six.
  const std::vector<std::uint8_t> noise = Noise(1200 + 6 * 1448 + 64);
  for (std::size_t chunks = 1; chunks <= 6; ++chunks) {
    for (std::size_t off = 0; off <= 48; ++off) {
      const std::size_t size = 1200 + chunks * 1448 - 24 + off;
      ASSERT_EQ(Ours(noise.data() + off % 5, size), Zlib(noise.data() + off % 5, size)) << size;
    }
  }
}

TEST(Crc32Test, IsTheSameHoweverTheBytesAreCutIntoPieces) {
  const std::vector<std::uint8_t> noise = Noise(40000);
  const std::uint32_t whole = Zlib(noise.data(), noise.size());
  std::mt19937 random(7);
  for (const std::size_t largest : {1U, 3U, 7U, 64U, 511U, 4096U, 16384U}) {
    base::Crc32 crc;
    for (std::size_t at = 0; at < noise.size();) {
      const std::size_t piece = std::min<std::size_t>(1 + random() % largest, noise.size() - at);
      crc.Update(noise.data() + at, piece);
      at += piece;
    }
    EXPECT_EQ(crc.value(), whole) << "pieces of up to " << largest;
  }
}

TEST(Crc32Test, GoesOnAfterItsValueWasAskedFor) {
  const std::vector<std::uint8_t> noise = Noise(5000);
  base::Crc32 crc;
  for (std::size_t at = 0; at < noise.size(); at += 500) {
    EXPECT_EQ(crc.value(), Zlib(noise.data(), at));
    crc.Update(noise.data() + at, 500);
  }
  EXPECT_EQ(crc.value(), Zlib(noise.data(), noise.size()));
}

TEST(Crc32Test, AgreesWithZlibOnRunsOfOneByte) {
  for (const int byte : {0x00, 0x01, 0x80, 0xFF}) {
    const std::vector<std::uint8_t> run(70000, static_cast<std::uint8_t>(byte));
    EXPECT_EQ(Ours(run.data(), run.size()), Zlib(run.data(), run.size())) << byte;
  }
}

}  // namespace
