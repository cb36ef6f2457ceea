#include "mcftp/client/frames.h"

#include <cctype>
#include <stdexcept>

namespace test {

std::string Hex(std::string_view text) {
  std::string bytes;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == ' ') continue;
    if (i + 1 >= text.size()) throw std::invalid_argument("half a byte");
    bytes += static_cast<char>(std::stoi(std::string(text.substr(i, 2)), nullptr, 16));
    ++i;
  }
  return bytes;
}

std::string ToHex(std::string_view bytes) {
  static constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const char byte : bytes) {
    const auto value = static_cast<unsigned char>(byte);
    if (!text.empty()) text += ' ';
    text += kDigits[value >> 4U];
    text += kDigits[value & 0xFU];
  }
  return text;
}

std::string Big(std::uint64_t value, int width) {
  std::string bytes;
  for (int shift = (width - 1) * 8; shift >= 0; shift -= 8) {
    bytes += static_cast<char>((value >> static_cast<unsigned>(shift)) & 0xFFU);
  }
  return bytes;
}

std::string Announcement(const Offer& offer) {
  std::string stamp = offer.stamp;
  stamp.resize(20);
  const std::string zero(1, '\0');
  return Hex(offer.header) + Big(0, 2) + Big(offer.block_size, 2) + Big(offer.size, 4) +
         Big(offer.oack_wait_ms, 4) + Big(offer.attributes, 4) + Big(offer.id, 4) + stamp +
         Big(offer.port, 2) + Big(offer.address, 4) + Big(offer.step_percent, 1) +
         Big(offer.step_kib, 2) + offer.name + zero + offer.masks + zero;
}

std::string Data(unsigned block, std::size_t length, char fill) {
  return Hex("00 30") + Big(length, 2) + Big(block, 2) + std::string(length, fill);
}

std::string Data(unsigned block, std::size_t length) {
  return Data(block, length, static_cast<char>('A' + (block - 1) % 26));
}

const std::string kOackPassive = Hex("00 70 00 00 1b 58 ef 01 01 02");
const std::string kOackAck = Hex("00 74 00 00 1b 58 ef 01 01 02");
const std::string kOackNak = Hex("00 78 00 00 1b 58 ef 01 01 02");

std::string Ack(unsigned block) {
  return Hex("00 40 00 00") + Big(block, 2);
}
std::string Nak(unsigned block) {
  return Hex("00 50 00 00") + Big(block, 2);
}

std::string Request(const Offer& offer) {
  const std::string header = offer.header == "00 21" ? "00 11" : "00 10";
  return Hex(header) + std::string(16, '\0') + Big(offer.id, 4) + std::string(29, '\0') +
         offer.name + std::string(1, '\0');
}

}  // namespace test
