// tools/wireshark/mcftp.lua in tshark, over captures of frames written down by hand.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <random>
#include <string>
#include <string_view>

#include "mcftp/golden_frames.h"
#include "server/capture.h"
#include "support/hex.h"

namespace {

using server::Peer;
using test::Hex;

constexpr Peer kServer{0x0A000002, 7001};
constexpr Peer kPublicGroup{0xEF010101, 7000};
constexpr Peer kPrivateGroup{0xEF010102, 7000};
constexpr Peer kClient{0x0A000064, 7000};
constexpr Peer kHere{0x7F000001, 1025};
constexpr Peer kListener{0x7F000001, 5655};

std::string_view AsText(const test::Bytes& bytes) {
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

struct Output {
  int exit_code = -1;
  std::string text;
};

Output RunShell(const std::string& command) {
  Output output;
  std::FILE* pipe = ::popen(command.c_str(), "r");
  if (pipe == nullptr) return output;
  char part[4096];
  for (std::size_t got; (got = std::fread(part, 1, sizeof part, pipe)) > 0;) {
    output.text.append(part, got);
  }
  output.exit_code = WEXITSTATUS(::pclose(pipe));
  return output;
}

class DissectorTest : public testing::Test {
 protected:
  void SetUp() override {
    if (RunShell("tshark --version 2>/dev/null").exit_code != 0) {
      GTEST_SKIP() << "tshark is not installed (apt-get install tshark)";
    }
  }
  void TearDown() override { std::filesystem::remove(path_); }

  void Add(Peer from, Peer to, const test::Bytes& frame) {
    records_ += server::CaptureRecord(server::Micros(++packets_), from, to, AsText(frame));
  }
  void Add(Peer from, Peer to, const char* frame) { Add(from, to, Hex(frame)); }

  /// The fields of every packet, separated by '|', one packet a line.
  std::string Fields(const std::string& names, const std::string& options = "") {
    std::FILE* file = std::fopen(path_.c_str(), "wb");
    const std::string capture = server::CaptureHeader() + records_;
    std::fwrite(capture.data(), 1, capture.size(), file);
    std::fclose(file);
    // A home of its own: no settings of whoever runs the test, and no plugins.
    std::string command = "HOME=/nonexistent tshark -n -X lua_script:" ORVENIX_DISSECTOR " -r " +
                          path_.string() + " " + options + " -T fields -E separator='|'";
    std::string name;
    for (const char letter : names + " ") {
      if (letter != ' ') {
        name += letter;
      } else {
        command += " -e " + name;
        name.clear();
      }
    }
    const Output output = RunShell(command + " 2>&1");
    EXPECT_EQ(output.exit_code, 0) << output.text;
    std::string lines;
    // As root, tshark says first that this is dangerous.
    for (std::size_t at = 0; at < output.text.size();) {
      const std::size_t end = output.text.find('\n', at);
      const std::string line = output.text.substr(at, end - at);
      if (line.find("Running as user") == std::string::npos) lines += line + "\n";
      at = end == std::string::npos ? output.text.size() : end + 1;
    }
    return lines;
  }

 private:
  std::filesystem::path path_ = std::filesystem::temp_directory_path() /
                                ("orvenix-golden-" + std::to_string(::getpid()) + ".pcap");
  std::string records_;
  int packets_ = 0;
};

TEST_F(DissectorTest, NamesEveryFrameAndSaysWhatIsInIt) {
  Add(kServer, kPublicGroup, golden::kAnnouncement);
  Add(kClient, kServer, golden::kReadRequest);
  Add(kServer, kClient, golden::kOackPassive);
  Add(kServer, kClient, golden::kOackAckMaster);
  Add(kClient, kServer, golden::kAck0);
  Add(kServer, kPrivateGroup, golden::kData);
  Add(kClient, kServer, golden::kDuplicateAck5);
  Add(kServer, kClient, golden::kOackNakMaster);
  Add(kClient, kServer, golden::kNak2);
  Add(kClient, kServer, golden::kOverrun);
  Add(kServer, kClient, golden::kUnknownTransfer);
  Add(kHere, kListener, golden::kStatus);

  EXPECT_EQ(Fields("_ws.col.Protocol _ws.col.Info"),
            "MCFTP|Announcement: \\Temp\\a.bin, 1300 bytes, 3 blocks\n"
            "MCFTP|RRQ: \\Temp\\a.bin\n"
            "MCFTP|OACK: 239.1.1.2:7000, passive\n"
            "MCFTP|OACK: 239.1.1.2:7000, master, answers with ACK\n"
            "MCFTP|ACK: block 0\n"
            "MCFTP|DATA: block 3, 5 bytes\n"
            "MCFTP|ACK: block 5, again\n"
            "MCFTP|OACK: 239.1.1.2:7000, master, answers with NAK\n"
            "MCFTP|NAK: block 2\n"
            "MCFTP|ERROR: 64 Overrun:6750:120\n"
            "MCFTP|ERROR: 5 Unknown transfer ID\n"
            "MCFTP progress|39% of \\Temp\\a.bin\n");
}

TEST_F(DissectorTest, ShowsEveryFieldOfAnAnnouncement) {
  Add(kServer, kPublicGroup, golden::kAnnouncement);
  Add(kServer, kPublicGroup, golden::kMaskedAnnouncement);

  EXPECT_EQ(Fields("mcftp.opcode mcftp.last_file mcftp.block_size mcftp.file_size mcftp.blocks "
                   "mcftp.oack_wait mcftp.attributes mcftp.transfer mcftp.time_stamp "
                   "mcftp.server_port mcftp.server_address mcftp.step_percent mcftp.step_kib "
                   "mcftp.file_name mcftp.masks"),
            "2|1|512|1300|3|1000|0x00000020|0x00000011|2006-03-01 14:05:09|7001|10.0.0.2|5|0|"
            "\\Temp\\a.bin|\n"
            "2|0|512|2500|5|1000|0x00000020|0x00000012|2006-03-01 14:05:09|7001|10.0.0.2|5|0|"
            "\\Temp\\b.bin|TQ5*\n");
}

TEST_F(DissectorTest, ShowsTheFieldsOfTheOtherFrames) {
  Add(kClient, kServer, golden::kReadRequest);
  Add(kServer, kClient, golden::kOackNakMaster);
  Add(kServer, kPrivateGroup, golden::kData);
  Add(kClient, kServer, golden::kDuplicateAck5);
  Add(kClient, kServer, golden::kOverrun);

  EXPECT_EQ(Fields("mcftp.opcode mcftp.transfer mcftp.file_name mcftp.role mcftp.group_port "
                   "mcftp.group_address mcftp.length mcftp.block mcftp.data mcftp.duplicate "
                   "mcftp.code mcftp.message"),
            "1|0x00000011|\\Temp\\a.bin|||||||||\n"
            "7|||2|7000|239.1.1.2||||||\n"
            "3||||||5|3|68656c6c6f|||\n"
            "4|||||||5||1||\n"
            "6||||||||||64|Overrun:6750:120\n");
}

TEST_F(DissectorTest, OpensEncipheredFramesWithTheKeyOfClientsAndServers) {
  Add(kClient, kServer, golden::kEncipheredAck5);
  Add(kClient, kServer, golden::kEncipheredNak2);
  Add(kServer, kClient, golden::kEncipheredOackAckMaster);
  Add(kClient, kServer, golden::kEncipheredOverrun);

  EXPECT_EQ(Fields("mcftp.encrypted _ws.col.Info"),
            "1|ACK (enciphered): block 5\n"
            "1|NAK (enciphered): block 2\n"
            "1|OACK (enciphered): 239.1.1.2:7000, master, answers with ACK\n"
            "1|ERROR (enciphered): 64 Overrun:6750:120\n");
}

TEST_F(DissectorTest, OnlyMarksEncipheredBodiesWithoutAKey) {
  Add(kClient, kServer, golden::kEncipheredAck5);

  EXPECT_EQ(
      Fields("mcftp.encrypted mcftp.enciphered_body mcftp.block _ws.col.Info", "-o mcftp.key:"),
      "1|5b7ced9dcb7689c0||ACK (enciphered)\n");
}

TEST_F(DissectorTest, OpensFramesOfAnotherKey) {
  Add(kClient, kServer, "80 40 ea 85 c8 a3 b3 68 8a 1c");

  EXPECT_EQ(Fields("mcftp.block",
                   "-o mcftp.key:000102030405060708090a0b0c0d0e0f101112131415161718191a1b1c1d1e1f"),
            "5\n");
}

TEST_F(DissectorTest, SaysWhyAReceiverDropsAFrame) {
  Add(kClient, kServer, "00");
  Add(kClient, kServer, "10 40 00 00 00 05");
  Add(kClient, kServer, "00 40 00 00 00");
  Add(kClient, kServer, "80 40 00 00 00 05");
  Add(kServer, kPrivateGroup, "00 30 00 05 00 01 00");
  test::Bytes announcement = Hex(golden::kAnnouncement);
  announcement[4] = 0;
  Add(kServer, kPublicGroup, announcement);
  announcement.resize(60);
  Add(kServer, kPublicGroup, announcement);

  EXPECT_EQ(Fields("_ws.col.Info"),
            "Dropped: shorter than its header\n"
            "Dropped: reserved bits are set\n"
            "Dropped: shorter than its fixed part\n"
            "Dropped: an enciphered body is a multiple of 8 bytes\n"
            "Dropped: its fields do not fit together\n"
            "Dropped: its fields do not fit together\n"
            "Dropped: its fields do not fit together\n");
}

TEST_F(DissectorTest, FindsFramesOnOtherPortsByTheirLook) {
  constexpr Peer kOther{0xEF010101, 9000};
  constexpr Peer kOtherServer{0x0A000002, 9001};
  Add(kOtherServer, kOther, golden::kAnnouncement);
  Add(kOtherServer, kOther, golden::kData);
  Add(kOther, kOtherServer, golden::kAck5);
  Add(kOtherServer, kOther, "ff ff 00 01");

  EXPECT_EQ(Fields("_ws.col.Protocol"), "MCFTP\nMCFTP\nMCFTP\nUDP\n");
  EXPECT_EQ(Fields("_ws.col.Protocol", "-o mcftp.port:9000"), "MCFTP\nMCFTP\nMCFTP\nMCFTP\n");
}

TEST_F(DissectorTest, TakesEveryLengthOfEveryFrame) {
  const char* const kFrames[] = {golden::kAnnouncement,
                                 golden::kReadRequest,
                                 golden::kData,
                                 golden::kAck5,
                                 golden::kNak2,
                                 golden::kOverrun,
                                 golden::kEncipheredOverrun,
                                 golden::kOackPassive};
  std::size_t packets = 0;
  for (const char* golden_frame : kFrames) {
    for (test::Bytes frame = Hex(golden_frame); !frame.empty(); frame.pop_back()) {
      Add(kServer, kPublicGroup, frame);
      ++packets;
    }
  }

  const std::string output = Fields("_ws.col.Protocol _ws.lua.error");
  std::string expected;
  for (std::size_t i = 0; i < packets; ++i) expected += "MCFTP|\n";
  EXPECT_EQ(output, expected);
}

TEST_F(DissectorTest, TakesAnyBytes) {
  std::mt19937 random(7000);
  for (int i = 0; i < 2000; ++i) {
    test::Bytes frame(2 + random() % 120);
    for (std::uint8_t& byte : frame) {
      byte = static_cast<std::uint8_t>(random() % 4 == 0 ? random() : 0);
    }
    frame[0] = static_cast<std::uint8_t>(random() % 2 == 0 ? 0x80 : 0);
    frame[1] = static_cast<std::uint8_t>(random());
    Add(kServer, kPublicGroup, frame);
  }

  EXPECT_EQ(Fields("frame.number _ws.lua.error", "-Y '_ws.lua.error or !mcftp'"), "");
}

TEST_F(DissectorTest, TakesATimeStampThatFillsItsField) {
  test::Bytes frame = Hex(golden::kAnnouncement);
  std::fill_n(frame.begin() + 22, 20, std::uint8_t{'9'});
  Add(kServer, kPublicGroup, frame);

  EXPECT_EQ(Fields("mcftp.time_stamp mcftp.file_name"), "99999999999999999999|\\Temp\\a.bin\n");
}

TEST_F(DissectorTest, ReadsCapturesWhoseChecksumsAreRight) {
  Add(kServer, kPublicGroup, golden::kAnnouncement);
  Add(kClient, kServer, golden::kOverrun);  // an odd length
  Add(kClient, kServer, golden::kAck5);

  EXPECT_EQ(Fields("ip.checksum.status udp.checksum.status frame.time_epoch",
                   "-o ip.check_checksum:TRUE -o udp.check_checksum:TRUE"),
            "1|1|0.000001000\n1|1|0.000002000\n1|1|0.000003000\n");
}

}  // namespace
