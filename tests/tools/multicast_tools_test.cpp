// What the server's multicast half shows, and how it is spoken to.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>
#include <string>

#include "tools/explain/catalogue.h"
#include "tools/explain/text_match.h"
#include "tools/failure.h"
#include "tools/multicast_road.h"
#include "tools/multicast_table.h"
#include "tools/serve_control.h"

namespace tools {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using Kind = ServeCommand::Kind;

TEST(RateTest, IsReadWithItsUnitAndShownWithOne) {
  EXPECT_EQ(ParseRate("0"), 0U);
  EXPECT_EQ(ParseRate("64000"), 64'000U);
  EXPECT_EQ(ParseRate("800k"), 800'000U);
  EXPECT_EQ(ParseRate("1.5G"), 1'500'000'000U);
  EXPECT_EQ(FormatRate(0), "no limit");
  EXPECT_EQ(FormatRate(800'000), "800.0 kbit/s");
  EXPECT_EQ(FormatRate(ParseRate("10M")), "10.0 Mbit/s");
  for (const char* text : {"", "fast", "10 M", "-1", "1T", "nan", "M", "1e9", "9999G"}) {
    EXPECT_THROW(static_cast<void>(ParseRate(text)), Failure) << text;
  }
}

TEST(RateTest, IsAsLargeAsDevicesNeedIt) {
  EXPECT_EQ(ParseRate("10k"), 10'000U);
  for (const char* text : {"0.4", "300", "9.9k"}) {
    EXPECT_THROW(static_cast<void>(ParseRate(text)), Failure) << text;
  }
}

TEST(RateTest, IsMeasuredOverASecond) {
  using std::chrono::milliseconds;
  RateMeter meter;
  meter.See(1'000, milliseconds(5'000));
  meter.See(2'000, milliseconds(5'500));
  EXPECT_EQ(meter.bits_per_second(), 0U) << "too early to say";
  meter.See(126'000, milliseconds(6'000));
  EXPECT_EQ(meter.bits_per_second(), 1'000'000U);
}

TEST(ServeCommandTest, IsAKeyOrALine) {
  EXPECT_EQ(ParseServeCommand("+")->kind, Kind::kFaster);
  EXPECT_EQ(ParseServeCommand(" -\r")->kind, Kind::kSlower);
  EXPECT_EQ(ParseServeCommand("s")->kind, Kind::kStart);
  EXPECT_EQ(ParseServeCommand("start")->kind, Kind::kStart);
  EXPECT_EQ(ParseServeCommand("rate 10M")->rate, 10'000'000U);
  EXPECT_EQ(ParseServeCommand("rate  0 ")->kind, Kind::kRate);
  for (const char* line : {"", " ", "rate", "rate fast", "stop", "++", "x"}) {
    EXPECT_FALSE(ParseServeCommand(line)) << line;
  }
}

TEST(ClientTextsTest, AreFoundInLinesOfTheClientsLog) {
  const TextMatcher matcher(false, ClientTexts());
  const auto meaning = [&matcher](std::string_view line) -> std::string {
    const TextMatch match = matcher.Find(SplitStamp(line).message);
    return match.row == nullptr ? "nothing" : match.row->meaning;
  };

  EXPECT_EQ(meaning("NAKing block 81 of 200"), "it asks for the first block that it lacks");
  EXPECT_EQ(meaning("Opening: \\Temp\\a.bin (1300)"), "the file is made, with its size");
  EXPECT_THAT(meaning("< 14>2006-03-01 14:05:09 << OVERRUN ERROR: 67.50 at 120"),
              HasSubstr("blocks come faster"));
  EXPECT_EQ(meaning("Last file flag set"), "the announced file is the last one of the run");
  EXPECT_EQ(meaning("nobody says this"), "nothing");
  std::set<std::string> formats;
  for (const TextRow& row : ClientTexts()) {
    EXPECT_TRUE(formats.insert(row.format).second) << row.format;
    EXPECT_STRNE(row.meaning, "") << row.format;
  }
}

std::string Complaint(const std::string& wished) {
  try {
    static_cast<void>(FindInterface(wished));
  } catch (const Failure& failure) {
    EXPECT_EQ(failure.code(), ExitCode::kCannotListen);
    return failure.what();
  }
  return "nothing";
}

TEST(MulticastRoadTest, FindsInterfacesByNameAndByAddress) {
  EXPECT_EQ(FindInterface("127.0.0.2").address, "127.0.0.2");
  EXPECT_EQ(FindInterface("127.0.0.2").name, "lo");
  EXPECT_EQ(FindInterface("lo").address, "127.0.0.1");
  EXPECT_THAT(Complaint("wlan17"), HasSubstr("this machine has no interface \"wlan17\""));
  EXPECT_THAT(Complaint("203.0.113.1"), HasSubstr("127.0.0.1 (lo)"));
}

TEST(MulticastRoadTest, TriesTheWayToAGroup) {
  EXPECT_NO_THROW(CheckMulticastRoad({"lo", "127.0.0.2"}, "239.1.1.1", 7000));
  EXPECT_THROW(CheckMulticastRoad({"lo", "127.0.0.2"}, "10.0.0.1", 7000), Failure);
  EXPECT_THROW(CheckMulticastRoad({"eth7", "203.0.113.1"}, "239.1.1.1", 7000), Failure);
  EXPECT_THAT(RoadRemedy(ENETUNREACH, {"eth0", "10.0.0.2"}, "239.1.1.1"),
              HasSubstr("ip route add 224.0.0.0/4 dev eth0"));
}

server::MulticastFigures Figures() {
  server::MulticastFigures figures;
  figures.rate = 10'000'000;
  figures.frames_sent = 1100;
  server::FileFigures file;
  file.device_path = "\\a.bin";
  file.size = 140'000;
  file.block_size = 1400;
  file.block_count = 100;
  file.expected = 3;
  file.phase = server::FilePhase::kStreaming;
  file.first_pass_frames = 50;
  file.repair_frames = 5;
  file.frames = 70;
  file.window = 32;
  server::DeviceFigures proven;
  proven.peer = {0x7F000003, 7000};
  proven.state = server::DeviceState::kProven;
  server::DeviceFigures dead;
  dead.peer = {0x7F000001, 7000};
  dead.state = server::DeviceState::kDead;
  dead.reason = "silent for 10 s";
  dead.last_heard = "NAK 12";
  dead.loss = 0.25;
  file.devices = {proven, dead};
  figures.files = {file};
  return figures;
}

TEST(MulticastTableTest, ShowsTheFileUnderWayAndItsDevices) {
  const std::string table = FormatMulticast(Figures(), 4, 9'400'000, 10);

  EXPECT_THAT(table, HasSubstr("multicast file 1 of 4, round 1: \\a.bin, 136.7 KiB\n"));
  EXPECT_THAT(table, HasSubstr("streaming  50%  joined 2 of 3  window 32  rate 9.4 Mbit/s of "
                               "10.0 Mbit/s  repairs 10.0%\n"));
  EXPECT_THAT(table, HasSubstr("127.0.0.1:7000        dead      passive      25.0%"));
  EXPECT_THAT(FormatMulticast(Figures(), 4, 0, 1), HasSubstr("... and 1 more\n"));
  EXPECT_EQ(FormatMulticast({}, 4, 0, 10), "");
}

TEST(MulticastTableTest, ReportsEachFileAndWhoHasNotProvedIt) {
  const std::string report = FormatMulticastReport(Figures());

  EXPECT_THAT(report, HasSubstr("multicast: 1 of 2 transfers proven, 1100 frames sent, 5 of them "
                                "repairs\n"));
  EXPECT_THAT(report, HasSubstr("  \\a.bin: 1 of 2 devices proven, 70 frames, 5 repairs (10.0%)"));
  EXPECT_THAT(report, HasSubstr("127.0.0.1:7000 dead: silent for 10 s, last heard NAK 12\n"));
  EXPECT_THAT(report, Not(HasSubstr("127.0.0.3")));
}

TEST(MulticastTableTest, SaysWhatTheSystemRefused) {
  server::MulticastFigures figures = Figures();
  EXPECT_THAT(FormatMulticastReport(figures), Not(HasSubstr("refused")));
  figures.refused = 7;
  figures.not_stored = 1;
  const std::string report = FormatMulticastReport(figures);
  EXPECT_THAT(report,
              HasSubstr("  7 datagrams of these did not go out: the system refused to send\n"));
  EXPECT_THAT(report, HasSubstr("  the session file could not be written 1 time: "));
  EXPECT_THAT(FormatMulticast(figures, 1, 0, 1),
              HasSubstr("  7 datagrams of these did not go out: "));
  EXPECT_EQ(ToJson(figures).at("refused"), 7);
  EXPECT_TRUE(ToJson(figures).at("rivals").empty());
  figures.rivals = {{0x0A000003, 7001}};
  EXPECT_THAT(FormatMulticastReport(figures),
              HasSubstr("  10.0.0.3:7001 announces on the same group: "
                        "what devices say may be meant for that server\n"));
  EXPECT_EQ(ToJson(figures).at("rivals").at(0), "10.0.0.3:7001");
  EXPECT_EQ(ToJson(figures).at("not_stored"), 1);
}

TEST(MulticastTableTest, MeasuresTheRateOfEachFile) {
  server::MulticastFigures figures = Figures();
  EXPECT_EQ(ToJson(figures).at("files").at(0).at("bits_per_second"), 0);
  figures.files[0].data_began = std::chrono::seconds(2);
  figures.files[0].ended = std::chrono::seconds(4);
  figures.files[0].wire_bytes = 250'000;
  EXPECT_EQ(ToJson(figures).at("files").at(0).at("bits_per_second"), 1'000'000);
}

TEST(MulticastTableTest, TellsTheSameInJson) {
  const auto json = ToJson(Figures());

  const auto& file = json.at("files").at(0);
  EXPECT_EQ(file.at("proven"), 1);
  EXPECT_EQ(file.at("phase"), "streaming");
  EXPECT_EQ(file.at("devices").at(1).at("state"), "dead");
  EXPECT_EQ(file.at("devices").at(1).at("last_heard"), "NAK 12");
  EXPECT_EQ(MulticastProgressJson(Figures(), 5).at("repair_frames"), 5);
  EXPECT_TRUE(MulticastProgressJson({}, 5).is_null());
}

TEST(MulticastTableTest, TellsAnEventInOneLine) {
  const server::MulticastFigures figures = Figures();
  server::MulticastEvent event;
  event.kind = server::MulticastEventKind::kFileEnded;
  event.when = std::chrono::milliseconds(3500);
  event.file = &figures.files[0];

  const std::string line = ToLine(event, std::chrono::milliseconds(1000));

  EXPECT_THAT(line, HasSubstr("    2.500  "));
  EXPECT_THAT(line, HasSubstr("multicast  \\a.bin  1 of 2 proven, 70 frames, 5 repairs"));
  EXPECT_EQ(line.find('\n'), std::string::npos);
}

}  // namespace
}  // namespace tools
