#include "tools/world_capture.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include "server/capture.h"

namespace {

using sim::FrameKind;
using sim::Micros;

constexpr sim::Endpoint kServer{0x0A000002, 7001};
constexpr sim::Endpoint kGroup{0xEF010102, 7000};
constexpr sim::Address kA = 0x0A000064;
constexpr sim::Address kB = 0x0A000065;

/// Block 1 reaches A late and B soon, block 2 nobody, block 3 B alone.
std::vector<sim::Frame> Frames() {
  return {{FrameKind::kDatagram,
           Micros(10),
           kServer,
           kGroup,
           "1",
           {{kA, Micros(90)}, {kB, Micros(20)}}},
          {FrameKind::kSegment, Micros(15), kServer, {kA, 80}, "tcp", {{kA, Micros(16)}}},
          {FrameKind::kDatagram, Micros(30), kServer, kGroup, "2", {}},
          {FrameKind::kDatagram, Micros(40), kServer, kGroup, "3", {{kB, Micros(50)}}}};
}

std::string Record(int when, const char* payload) {
  return server::CaptureRecord(server::Micros(when), {0x0A000002, 7001}, {0xEF010102, 7000},
                               payload);
}

std::string Captured(std::optional<sim::Address> ear) {
  const auto path = std::filesystem::temp_directory_path() /
                    ("orvenix-world-" + std::to_string(::getpid()) + ".pcap");
  tools::WriteCapture(path, Frames(), ear);
  std::ifstream in(path, std::ios::binary);
  const std::string bytes{std::istreambuf_iterator<char>(in), {}};
  std::filesystem::remove(path);
  return bytes;
}

TEST(WorldCaptureTest, HoldsTheDatagramsThatWereSentLostOrNot) {
  EXPECT_EQ(Captured(std::nullopt),
            server::CaptureHeader() + Record(10, "1") + Record(30, "2") + Record(40, "3"));
}

TEST(WorldCaptureTest, HoldsWhatOneHostHeardWhenItHeardIt) {
  EXPECT_EQ(Captured(kA), server::CaptureHeader() + Record(90, "1"));
  EXPECT_EQ(Captured(kB), server::CaptureHeader() + Record(20, "1") + Record(50, "3"));
}

TEST(WorldCaptureTest, SaysThatItCannotBeWritten) {
  EXPECT_THROW(tools::WriteCapture("/nowhere/at/all.pcap", Frames()), std::runtime_error);
}

}  // namespace
