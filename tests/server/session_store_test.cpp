#include "server/multicast/session_store.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <functional>
#include <string>

#include "server/model_client.h"
#include "server/multicast_script.h"
#include "server/scratch_folder.h"

namespace server {
namespace {

using test::ModelNetwork;

RunMemory SomeMemory() {
  RunMemory memory;
  memory.fingerprint = 12345;
  memory.round = 2;
  memory.port = 7001;
  FileMemory finished;
  finished.transfer_id = 7;
  finished.phase = FilePhase::kFinished;
  finished.first_unsent = 101;
  finished.last_sent = true;
  finished.sent.frames = 120;
  finished.sent.wire_bytes = 0xFFFFFFFFFF;
  finished.devices = {{kA, DeviceState::kProven, true, false, "", "ACK 100"},
                      {kB, DeviceState::kDead, false, true, "could not write a block: Disk full",
                       "ERROR 3 Disk full"}};
  FileMemory current;
  current.index = 1;
  current.transfer_id = 0xFFFFFFFF;
  current.phase = FilePhase::kRepairing;
  current.first_unsent = 65534;
  current.devices = {{kC, DeviceState::kJoined, true, false, "", "NAK 7"}};
  memory.files = {finished, current};
  return memory;
}

TEST(RunMemoryTest, ReadsWhatItHasWritten) {
  const std::string text = ToText(SomeMemory());
  const auto memory = ParseRunMemory(text);
  ASSERT_TRUE(memory.has_value());
  EXPECT_EQ(ToText(*memory), text);
  EXPECT_EQ(memory->files[0].devices[1].peer, kB);
  EXPECT_EQ(memory->files[1].phase, FilePhase::kRepairing);
}

TEST(RunMemoryTest, TakesATextThatWasCutAsFarAsItsLinesAreWhole) {
  const std::string text = ToText(SomeMemory());
  const std::size_t first_line = text.find('\n') + 1;
  for (std::size_t length = 0; length < text.size(); ++length) {
    const auto memory = ParseRunMemory(text.substr(0, length));
    ASSERT_EQ(memory.has_value(), length >= first_line) << length;
    if (length <= first_line || text[length - 1] != '\n') continue;
    EXPECT_EQ(memory->port, 7001) << length;
  }
}

TEST(RunMemoryTest, TakesNoOtherText) {
  const std::string first = "orvenix multicast session 2\n";
  EXPECT_TRUE(ParseRunMemory(first));
  for (const char* line :
       {"device 10.0.0.1:7 joined 0 0\t\tRRQ", "run 1 2 three", "boat 1",
        "file 0 1 dreaming 1 0 0 0 0 0 0 0", "file 0 1 streaming 0 0 0 0 0 0 0 0",
        "file 0 1 streaming 65537 0 0 0 0 0 0 0", "file 0 1 streaming 1 0", ""}) {
    EXPECT_FALSE(ParseRunMemory(first + line + "\n")) << line;
  }
  const std::string file = first + "file 0 1 streaming 1 0 0 0 0 0 0 0\n";
  EXPECT_TRUE(ParseRunMemory(file));
  for (const char* line :
       {"device 10.0.0.1 joined 0 0\t\tRRQ", "device 10.0.0.1:7 happy 0 0\t\tRRQ",
        "device 10.0.0.1:7 joined 0 0", "device 10.0.0.1:7 joined 0\t\tRRQ"}) {
    EXPECT_FALSE(ParseRunMemory(file + line + "\n")) << line;
  }
  EXPECT_FALSE(ParseRunMemory("orvenix multicast session 1\n"));
}

TEST(RunMemoryTest, LetsALaterLineTakeThePlaceOfTheOneBefore) {
  const auto memory = ParseRunMemory(
      "orvenix multicast session 2\n"
      "run 1 1 7001\n"
      "file 0 5 streaming 1 0 0 0 0 0 0 0\n"
      "device 10.0.0.1:7 joined 0 0\t\tRRQ\n"
      "device 10.0.0.2:7 joined 0 0\t\tRRQ\n"
      "run 1 2 7001\n"
      "file 0 5 closing 100 1 99 0 0 0 0 0\n"
      "device 10.0.0.1:7 proven 1 0\t\tACK 100\n");
  ASSERT_TRUE(memory);
  EXPECT_EQ(memory->round, 2U);
  ASSERT_EQ(memory->files.size(), 1U);
  EXPECT_EQ(memory->files[0].phase, FilePhase::kClosing);
  ASSERT_EQ(memory->files[0].devices.size(), 2U);
  EXPECT_EQ(memory->files[0].devices[0].state, DeviceState::kProven);
  EXPECT_EQ(memory->files[0].devices[0].last_heard, "ACK 100");
  EXPECT_EQ(memory->files[0].devices[1].state, DeviceState::kJoined);
}

TEST(PeerTextTest, ReadsAddressesAsTheyAreWrittenAndNothingElse) {
  EXPECT_EQ(ToText(Peer{0x0A0000FF, 65535}), "10.0.0.255:65535");
  EXPECT_EQ(ParsePeer("10.0.0.255:65535"), (Peer{0x0A0000FF, 65535}));
  for (const char* wrong : {"", "10.0.0.1", "10.0.0:1", "10.0.0.256:1", "10.0.0.1:65536",
                            "10.0.0.1:", "10.0.0.1:1 ", "a.b.c.d:1", "10.0.0.-1:5"}) {
    EXPECT_FALSE(ParsePeer(wrong)) << wrong;
  }
  EXPECT_EQ(ParseAddress("239.1.1.1"), 0xEF010101U);
  EXPECT_FALSE(ParseAddress("239.1.1.1.1"));
}

class RestartedRunTest : public ::testing::Test {
 protected:
  RestartedRunTest() {
    options_.session_file = folder_.path() / "session";
    options_.start.expected = 4;
    for (int i = 0; i < 3; ++i) {
      contents_.push_back(SomeBytes(400'000));
      files_.push_back(FileOf("\\Temp\\" + std::to_string(i), contents_.back()));
    }
    link_.loss_down = link_.loss_up = 0.02;
    link_.bits_per_second = 10'000'000;
  }

  ScratchFolder folder_;
  MulticastOptions options_;
  std::vector<MulticastFile> files_;
  std::vector<std::string> contents_;
  ModelNetwork::Link link_;
};

TEST_F(RestartedRunTest, GoesOnAtWhateverMomentTheServerDies) {
  // A run takes some eight seconds; the server dies once in each of these moments.
  for (int tenths = 1; tenths < 90; tenths += 6) {
    std::filesystem::remove(options_.session_file);
    ModelNetwork network(options_, files_, 4, link_, 5);
    const auto moment = std::chrono::milliseconds(tenths * 100);
    network.At(moment, [&] {
      if (!network.run().finished()) network.RestartServer(options_, files_);
    });
    network.Run(std::chrono::minutes(3));
    ASSERT_TRUE(network.run().finished()) << "died at " << tenths << " tenths";
    for (std::size_t device = 0; device < 4; ++device) {
      for (std::size_t i = 0; i < files_.size(); ++i) {
        const auto& had = network.device(device).files();
        const auto file = had.find(files_[i].device_path);
        EXPECT_TRUE(file != had.end() && file->second == contents_[i])
            << "device " << device << ", file " << i << ", died at " << tenths << " tenths";
      }
    }
    EXPECT_FALSE(std::filesystem::exists(options_.session_file));
  }
}

TEST_F(RestartedRunTest, CallsNobodyProvenWhoGaveTheFileUpWhileThereWasNoServer) {
  for (int hundredths = 100; hundredths < 260; hundredths += 11) {
    std::filesystem::remove(options_.session_file);
    ModelNetwork network(options_, {files_[0]}, 4, link_, 5);
    network.At(std::chrono::milliseconds(hundredths * 10), [&] { network.KillServer(); });
    network.At(std::chrono::milliseconds(hundredths * 10 + 40'000),
               [&] { network.RestartServer(options_, {files_[0]}); });
    network.Run(std::chrono::minutes(5));
    ASSERT_TRUE(network.run().finished()) << "died at " << hundredths;
    for (const DeviceFigures& device : network.run().figures().files[0].devices) {
      if (device.state != DeviceState::kProven) continue;
      const auto& had =
          network.device(device.peer.address - ModelNetwork::PeerOf(0).address).files();
      const auto file = had.find(files_[0].device_path);
      EXPECT_TRUE(file != had.end() && file->second == contents_[0])
          << ToText(device.peer) << ", died at " << hundredths << " hundredths";
    }
  }
}

/// The server dies at once when it has sent a certain block: whatever it has not written by then is
/// gone.
TEST_F(RestartedRunTest, KnowsWhatItHasToOfEveryFrameThatWentOut) {
  const unsigned count = 286;  // blocks of 400,000 bytes
  for (const unsigned block : {1U, 2U, 257U, count - 2, count - 1, count}) {
    for (const int copies : {1, 2, 4}) {
      std::filesystem::remove(options_.session_file);
      ModelNetwork network(options_, {files_[0]}, 4, link_, 5);
      int seen = 0;
      network.passes_down = [&](std::size_t /*device*/, std::string_view bytes) {
        const bool is_it =
            (static_cast<unsigned char>(bytes[1]) >> 4U) == 3 && bytes.substr(4, 2) == Word(block);
        if (is_it && ++seen == copies) {
          network.At(network.now(), [&] { network.RestartServer(options_, {files_[0]}); });
        }
        return true;
      };
      network.Run(std::chrono::minutes(3));
      ASSERT_TRUE(network.run().finished());
      for (std::size_t device = 0; device < 4; ++device) {
        EXPECT_EQ(network.device(device).files().count(files_[0].device_path), 1U);
        EXPECT_TRUE(network.device(device).files().at(files_[0].device_path) == contents_[0])
            << "device " << device << ", died at copy " << copies << " of block " << block;
      }
      EXPECT_EQ(network.run().figures().files[0].Count(DeviceState::kProven), 4U)
          << "died at copy " << copies << " of block " << block;
    }
  }
}

TEST_F(RestartedRunTest, ReportsWhatTheServerBeforeItKnew) {
  ModelNetwork network(options_, {files_[0]}, 4, link_, 5);
  network.At(std::chrono::milliseconds(1200), [&] { network.SetDeaf(3, true); });
  const std::function<void()> watch = [&] {
    const FileFigures& file = network.run().figures().files[0];
    if (file.Count(DeviceState::kDead) == 1) {
      const std::uint64_t frames = file.frames;
      const DeviceFigures dead = *std::find_if(
          file.devices.begin(), file.devices.end(),
          [](const DeviceFigures& device) { return device.state == DeviceState::kDead; });
      network.RestartServer(options_, {files_[0]});
      const FileFigures& after = network.run().figures().files[0];
      EXPECT_GE(after.frames + 10, frames);
      EXPECT_LE(after.first_pass_frames, after.block_count);
      const auto same =
          std::find_if(after.devices.begin(), after.devices.end(),
                       [&dead](const DeviceFigures& device) { return device.peer == dead.peer; });
      ASSERT_NE(same, after.devices.end());
      EXPECT_EQ(same->reason, dead.reason);
      EXPECT_EQ(same->last_heard, dead.last_heard);
      EXPECT_FALSE(same->late);
    } else {
      network.At(network.now() + std::chrono::milliseconds(300), watch);
    }
  };
  network.At(std::chrono::seconds(2), watch);
  network.Run(std::chrono::minutes(3));
  ASSERT_TRUE(network.run().finished());
  EXPECT_EQ(network.run().figures().files[0].Count(DeviceState::kProven), 3U);
}

TEST_F(RestartedRunTest, GoesOnWithAFileThatKnowsOfMoreThanItMay) {
  {
    ModelNetwork network(options_, files_, 4, link_, 5);
    network.Run(std::chrono::seconds(2));
  }
  options_.start.expected = 2;
  options_.max_devices = 2;  // the session file has four
  options_.rounds = 1;
  ModelNetwork network(options_, files_, 4, link_, 5);
  network.Run(std::chrono::minutes(5));
  EXPECT_TRUE(network.run().finished());
  EXPECT_LE(network.run().figures().files[0].devices.size(), 2U);
}

TEST_F(RestartedRunTest, EndsWithTheRoundUnderWayWhenFewerAreWanted) {
  options_.rounds = 3;
  RunMemory memory;
  memory.fingerprint = Fingerprint(options_, files_);
  memory.round = 3;
  memory.port = 7001;
  FileMemory file;
  file.index = 2;
  file.transfer_id = 99;
  memory.files = {file};
  std::ofstream(options_.session_file) << ToText(memory);
  options_.rounds = 1;
  ModelNetwork network(options_, files_, 4, link_, 5);
  network.Run(std::chrono::minutes(5));
  EXPECT_TRUE(network.run().finished());
  ASSERT_EQ(network.run().figures().files.size(), 1U);
  EXPECT_EQ(network.run().figures().files[0].Count(DeviceState::kProven), 4U);
}

TEST_F(RestartedRunTest, BeginsAnewWhenItsFileNamesFilesThatAreNotThere) {
  RunMemory memory;
  memory.fingerprint = Fingerprint(options_, files_);
  memory.port = 7001;
  FileMemory file;
  file.index = 3;
  memory.files = {file};
  std::ofstream(options_.session_file) << ToText(memory);
  const MulticastRun run(options_, files_);
  EXPECT_EQ(run.former_port(), 0);
}

TEST_F(RestartedRunTest, WritesALineForADeviceThatJoinsHoweverManyThereAre) {
  options_.start.expected = 2000;
  options_.start.longest_wait = std::chrono::minutes(1);
  MulticastRun run(options_, files_);
  run.Start(kOwn, Micros(0));
  while (run.Next(Micros(0)) != nullptr) {
  }
  const auto request = [&run](std::uint32_t device) {
    const std::uint32_t id = run.figures().files[0].transfer_id;
    const std::string bytes = Bytes("00 10") + std::string(16, '\0') + Word(id >> 16U) +
                              Word(id & 0xFFFFU) + std::string(29, '\0') + "\\Temp\\0" +
                              std::string(1, '\0');
    run.OnDatagram({0x0A010000 + device, 7000}, bytes, Micros(1));
    while (run.Next(Micros(1)) != nullptr) {
    }
  };
  for (std::uint32_t i = 0; i < 500; ++i) request(i);
  ASSERT_EQ(run.figures().files[0].devices.size(), 500U);
  const auto size = std::filesystem::file_size(options_.session_file);
  request(500);
  const auto grown = std::filesystem::file_size(options_.session_file) - size;
  EXPECT_GT(grown, 20U);
  EXPECT_LT(grown, 200U);
}

TEST_F(RestartedRunTest, BeginsAnewWhenAFileHasOtherBytes) {
  {
    ModelNetwork network(options_, files_, 4, link_, 5);
    network.Run(std::chrono::seconds(2));
  }
  contents_[0][5] = static_cast<char>(contents_[0][5] ^ 1);
  files_[0].content = MemoryContent(contents_[0]);
  const MulticastRun run(options_, files_);
  EXPECT_EQ(run.former_port(), 0);
}

TEST_F(RestartedRunTest, AnnouncesNoFinishedFileAgainAndKeepsWhatWasProven) {
  ModelNetwork network(options_, files_, 4, link_, 5);
  std::size_t files_before = 0;
  const std::function<void()> watch = [&] {
    if (network.run().figures().current == 2) {
      files_before = network.run().figures().files.size();
      network.RestartServer(options_, files_);
    } else {
      network.At(network.now() + std::chrono::milliseconds(100), watch);
    }
  };
  network.At(Micros(0), watch);
  network.Run();
  ASSERT_TRUE(network.run().finished());
  EXPECT_EQ(files_before, 3U);
  const MulticastFigures& figures = network.run().figures();
  ASSERT_EQ(figures.files.size(), 3U);
  for (std::size_t i = 0; i < 3; ++i) {
    EXPECT_EQ(figures.files[i].Count(DeviceState::kProven), 4U) << "file " << i;
  }
  EXPECT_EQ(figures.files[0].announcements, 0U);
  EXPECT_EQ(figures.files[1].announcements, 0U);
}

TEST_F(RestartedRunTest, BeginsAnewWhenTheFilesAreOthers) {
  {
    ModelNetwork network(options_, files_, 4, link_, 5);
    network.Run(std::chrono::seconds(2));
    EXPECT_TRUE(std::filesystem::exists(options_.session_file));
  }
  files_[0].time_stamp = "2007-01-01 00:00:00";
  ModelNetwork network(options_, files_, 4, link_, 5);
  network.Run();
  EXPECT_EQ(network.run().figures().files.size(), 3U);
  EXPECT_GT(network.run().figures().files[0].announcements, 0U);
}

TEST_F(RestartedRunTest, RunsOnWhenItsFileCannotBeWritten) {
  options_.session_file = folder_.path() / "no" / "such" / "folder";
  ModelNetwork network(options_, files_, 4, link_, 5);
  network.Run();
  EXPECT_TRUE(network.run().finished());
  EXPECT_GT(network.run().figures().not_stored, 0U);
}

}  // namespace
}  // namespace server
