#include "server/capture.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include "support/hex.h"

namespace {

using server::Micros;
using server::Peer;
using test::ToHex;

std::string AsHex(const std::string& bytes) {
  return ToHex(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
}

constexpr Peer kServer{0x0A000002, 7001};
constexpr Peer kGroup{0xEF010101, 7000};

TEST(CaptureTest, BeginsWithAHeaderForIpPackets) {
  EXPECT_EQ(AsHex(server::CaptureHeader()),
            "d4 c3 b2 a1 02 00 04 00 00 00 00 00 00 00 00 00 ff ff 00 00 65 00 00 00");
}

TEST(CaptureTest, RecordsADatagramToTheByte) {
  const std::string ack("\x00\x40\x00\x00\x00\x05", 6);
  const std::string record = server::CaptureRecord(Micros(1500042), kServer, kGroup, ack);

  EXPECT_EQ(AsHex(record),
            "01 00 00 00 4a a1 07 00 22 00 00 00 22 00 00 00 "              // 1.500042 s, 34 bytes
            "45 00 00 22 00 00 00 00 40 11 80 c7 0a 00 00 02 ef 01 01 01 "  // IPv4
            "1b 59 1b 58 00 0e ce d7 "                                      // UDP
            "00 40 00 00 00 05");
}

TEST(CaptureTest, CutsNothingThatADatagramCanHold) {
  const std::string payload(server::kMaxCapturedPayload + 1, 'x');
  const std::string record = server::CaptureRecord(Micros(0), kServer, kGroup, payload);
  EXPECT_EQ(record.size(), 16U + 65535U);
}

TEST(CaptureTest, TakesAnEmptyDatagram) {
  const std::string record = server::CaptureRecord(Micros(0), kServer, kGroup, "");
  EXPECT_EQ(record.size(), 16U + 28U);
}

TEST(CaptureFileTest, IsTheHeaderAndItsRecords) {
  const auto path = std::filesystem::temp_directory_path() /
                    ("orvenix-capture-" + std::to_string(::getpid()) + ".pcap");
  {
    server::CaptureFile file(path);
    file.Add(Micros(7), kServer, kGroup, "ab");
    file.Add(Micros(8), kServer, kGroup, "c");
    EXPECT_TRUE(file.good());
  }
  std::ifstream in(path, std::ios::binary);
  const std::string bytes{std::istreambuf_iterator<char>(in), {}};
  std::filesystem::remove(path);

  EXPECT_EQ(bytes, server::CaptureHeader() +
                       server::CaptureRecord(Micros(7), kServer, kGroup, "ab") +
                       server::CaptureRecord(Micros(8), kServer, kGroup, "c"));
}

TEST(CaptureFileTest, SaysThatItCannotBeWritten) {
  EXPECT_THROW(server::CaptureFile("/nowhere/at/all.pcap"), std::runtime_error);
}

}  // namespace
