#include "server/multicast/session_store.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
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
  finished.devices = {{kA, DeviceState::kProven, true}, {kB, DeviceState::kDead, false}};
  FileMemory current;
  current.index = 1;
  current.transfer_id = 0xFFFFFFFF;
  current.phase = FilePhase::kRepairing;
  current.first_unsent = 65534;
  current.devices = {{kC, DeviceState::kJoined, true}};
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

TEST(RunMemoryTest, TakesNoTextThatWasCutOrChanged) {
  const std::string text = ToText(SomeMemory());
  for (std::size_t length = 0; length + 1 < text.size(); ++length) {
    EXPECT_FALSE(ParseRunMemory(text.substr(0, length))) << length;
  }
  EXPECT_FALSE(ParseRunMemory("orvenix multicast session 1\ndevice 10.0.0.1:7 joined 0\nend\n"));
  EXPECT_FALSE(ParseRunMemory("orvenix multicast session 1\nfile 0 1 dreaming 1 0\nend\n"));
  EXPECT_FALSE(ParseRunMemory("orvenix multicast session 1\nfile 0 1 streaming 0 0\nend\n"));
  EXPECT_FALSE(ParseRunMemory("orvenix multicast session 1\nfile 0 1 streaming 65537 0\nend\n"));
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
  for (int tenths = 1; tenths < 90; tenths += 3) {
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
