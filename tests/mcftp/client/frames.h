// Frames written by hand, so that the tests do not share a mistake with the code they test.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace test {

/// The bytes of "00 21 ff": hexadecimal, blanks where one likes.
std::string Hex(std::string_view text);
/// The other way: "00 21 ff".
std::string ToHex(std::string_view bytes);

/// `value` in `width` bytes, network order.
std::string Big(std::uint64_t value, int width);

/// What the worked exchanges announce, and what tests change about it.
struct Offer {
  std::string header = "00 20";
  std::uint64_t block_size = 512;
  std::uint64_t size = 1300;
  std::uint64_t oack_wait_ms = 1000;
  std::uint64_t attributes = 32;
  std::uint64_t id = 0x11;
  std::string stamp = "2006-03-01 14:05:09";  ///< at most 20 characters
  std::uint64_t port = 7001;
  std::uint64_t address = 0x0A000002;
  std::uint64_t step_percent = 5;
  std::uint64_t step_kib = 0;
  std::string name = "\\Temp\\a.bin";
  std::string masks;
};
std::string Announcement(const Offer& offer);

/// A DATA frame of `length` bytes, all of them `fill`.
std::string Data(unsigned block, std::size_t length, char fill);
/// The same with the first letter, from 'A' on, for the block: what tests look for in the file.
std::string Data(unsigned block, std::size_t length);

// The others, as the worked exchanges have them
extern const std::string kOackPassive;  ///< group 239.1.1.2:7000
extern const std::string kOackAck;
extern const std::string kOackNak;
std::string Ack(unsigned block);
std::string Nak(unsigned block);
/// The client's request for what an Offer announces.
std::string Request(const Offer& offer);

}  // namespace test
