#include "server/capture.h"

#include <cstdint>
#include <stdexcept>

namespace server {
namespace {

constexpr std::uint32_t kMagic = 0xA1B2C3D4;  // times in microseconds
constexpr std::uint32_t kRawIpPackets = 101;  // the link type: no Ethernet around them
constexpr std::size_t kIpHeader = 20;
constexpr std::size_t kUdpHeader = 8;
constexpr std::size_t kIpChecksumOffset = 10;
constexpr std::size_t kUdpChecksumOffset = 6;
constexpr unsigned char kUdpProtocol = 17;

/// The file's own fields; the magic number tells readers that they are little-endian.
void PutLittle(std::string& out, std::uint32_t value, int width) {
  for (int i = 0; i < width; ++i) out += static_cast<char>(value >> (8 * i) & 0xFF);
}

void PutBig(std::string& out, std::uint32_t value, int width) {
  for (int i = width; i-- > 0;) out += static_cast<char>(value >> (8 * i) & 0xFF);
}

/// The sum of the 16-bit words of `bytes`, an odd byte counting as the high one.
std::uint32_t SumOfWords(std::string_view bytes) {
  std::uint32_t sum = 0;
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    const auto byte = static_cast<unsigned char>(bytes[i]);
    sum += i % 2 == 0 ? static_cast<std::uint32_t>(byte) << 8 : byte;
  }
  return sum;
}

std::uint16_t Checksum(std::uint32_t sum) {
  while (sum >> 16 != 0) sum = (sum & 0xFFFF) + (sum >> 16);
  return static_cast<std::uint16_t>(~sum);
}

void SetChecksum(std::string& header, std::size_t offset, std::uint16_t checksum) {
  header[offset] = static_cast<char>(checksum >> 8);
  header[offset + 1] = static_cast<char>(checksum & 0xFF);
}

std::string Addresses(const Peer& from, const Peer& to) {
  std::string addresses;
  PutBig(addresses, from.address, 4);
  PutBig(addresses, to.address, 4);
  return addresses;
}

std::string IpHeader(const Peer& from, const Peer& to, std::size_t total) {
  std::string header;
  PutBig(header, 0x4500, 2);  // version 4, five words, ordinary service
  PutBig(header, static_cast<std::uint32_t>(total), 2);
  PutBig(header, 0, 4);  // never fragmented, so no identification
  header += static_cast<char>(64);
  header += static_cast<char>(kUdpProtocol);
  PutBig(header, 0, 2);
  header += Addresses(from, to);
  SetChecksum(header, kIpChecksumOffset, Checksum(SumOfWords(header)));
  return header;
}

std::string Udp(const Peer& from, const Peer& to, std::string_view payload) {
  const auto length = static_cast<std::uint32_t>(kUdpHeader + payload.size());
  std::string datagram;
  PutBig(datagram, from.port, 2);
  PutBig(datagram, to.port, 2);
  PutBig(datagram, length, 2);
  PutBig(datagram, 0, 2);
  datagram += payload;
  const std::uint32_t sum =
      SumOfWords(Addresses(from, to)) + kUdpProtocol + length + SumOfWords(datagram);
  const std::uint16_t checksum = Checksum(sum);
  SetChecksum(datagram, kUdpChecksumOffset, checksum == 0 ? 0xFFFF : checksum);  // 0: not computed
  return datagram;
}

}  // namespace

std::string CaptureHeader() {
  std::string header;
  PutLittle(header, kMagic, 4);
  PutLittle(header, 2, 2);  // version 2.4
  PutLittle(header, 4, 2);
  PutLittle(header, 0, 4);
  PutLittle(header, 0, 4);
  PutLittle(header, 0xFFFF, 4);  // packets are never cut
  PutLittle(header, kRawIpPackets, 4);
  return header;
}

std::string CaptureRecord(Micros when, const Peer& from, const Peer& to, std::string_view payload) {
  constexpr std::int64_t kPerSecond = 1000000;
  const std::string datagram = Udp(from, to, payload.substr(0, kMaxCapturedPayload));
  const auto packet = static_cast<std::uint32_t>(kIpHeader + datagram.size());
  std::string record;
  PutLittle(record, static_cast<std::uint32_t>(when.count() / kPerSecond), 4);
  PutLittle(record, static_cast<std::uint32_t>(when.count() % kPerSecond), 4);
  PutLittle(record, packet, 4);
  PutLittle(record, packet, 4);
  return record + IpHeader(from, to, packet) + datagram;
}

CaptureFile::CaptureFile(const std::filesystem::path& file)
    : out_(file, std::ios::binary | std::ios::trunc) {
  out_ << CaptureHeader();
  if (!out_.flush()) throw std::runtime_error("cannot write the capture " + file.string());
}

void CaptureFile::Add(Micros when, const Peer& from, const Peer& to, std::string_view payload) {
  out_ << CaptureRecord(when, from, to, payload);
}

}  // namespace server
