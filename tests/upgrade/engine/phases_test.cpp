// The phases that bring single files and lists onto the device, against the real server's engine.
#include "upgrade/phases.h"

#include <gmock/gmock.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "upgrade/engine/phases_test.h"

namespace upgrade {
namespace {

using std::chrono::seconds;
using test::Exists;
using test::GetFile;
using test::LogLinesWith;
using test::PutFile;
using test::ReadLog;
using test::StatusLines;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Optional;
// ---- one file ----

using FetchTest = PhasesTest;

TEST_F(FetchTest, MakesTheFolderAtALaterAttemptWhenThatHasFailed) {
  server().Put("a.bin", "new");
  device().faults().Add({"CreateDirectoryW", 2, 1, ERROR_DISK_FULL});
  EXPECT_TRUE(FetchFile(run(), "a.bin", "\\One\\Two\\Three\\a.bin", OnFailedGet::kTryAgain));
  EXPECT_THAT(GetFile("\\One\\Two\\Three\\a.bin"), Optional(std::string("new")));
}

TEST_F(FetchTest, BringsAFileIntoAFolderThatItMakes) {
  const std::string content(50000, 'x');
  server().Put("apps/a.bin", content);
  run().files_to_fetch = 14;

  EXPECT_TRUE(FetchFile(run(), "apps/a.bin", "\\Temp\\Deep\\a.bin", OnFailedGet::kTryAgain));

  EXPECT_THAT(GetFile("\\Temp\\Deep\\a.bin"), Optional(content));
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("apps/a.bin:1,14"));
  EXPECT_EQ(run().fetch_attempt, 2U);
  EXPECT_EQ(Sleeps(3000), 0U);
  EXPECT_EQ(http::BundleRx.load(), 50000U);
}

TEST_F(FetchTest, LogsTheUrlBeforeAndTheCloseAfterEveryAttempt) {
  server().Put("a.bin", "content");
  EXPECT_TRUE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTryAgain));
  const std::string log = ReadLog();
  EXPECT_EQ(log.rfind("Orvenix - before OpenURL\r\nhttp://127.0.0.2:80/a.bin:1,1\r\n", 0), 0U);
  EXPECT_THAT(log, ::testing::EndsWith("Orvenix - CSocketIO::Close\r\n"));
  EXPECT_THAT(LogLinesWith("CSocketIO::Close"), ::testing::SizeIs(1));
}

TEST_F(FetchTest, UsesAConnectionOfItsOwnForEveryAttempt) {
  server().Put("a.bin", "content a");
  server().Put("b.bin", "content b");
  EXPECT_TRUE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTryAgain));
  EXPECT_TRUE(FetchFile(run(), "b.bin", "\\b.bin", OnFailedGet::kTryAgain));
  EXPECT_EQ(server().received().size(), 2U);
  EXPECT_EQ(device().network().open_sockets(), 0U);
}

TEST_F(FetchTest, AsksAgainEveryThreeSecondsWithTheSameNumberUntilTheFileIsThere) {
  At(seconds(10), [this] { server().Put("a.bin", "late"); });

  EXPECT_TRUE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTryAgain));

  EXPECT_THAT(GetFile("\\a.bin"), Optional(std::string("late")));
  const auto paths = server().RequestedPaths();
  EXPECT_EQ(paths.size(), 5U) << "at 0, 3, 6, 9 and 12 seconds";
  for (const std::string& path : paths) EXPECT_EQ(path, "a.bin:1,1");
  EXPECT_EQ(run().fetch_attempt, 6U);
  EXPECT_EQ(Sleeps(3000), 4U);

  server().Put("b.bin", "b");
  EXPECT_TRUE(FetchFile(run(), "b.bin", "\\b.bin", OnFailedGet::kTryAgain));
  EXPECT_EQ(server().RequestedPaths().back(), "b.bin:6,1");
}

TEST_F(FetchTest, TakesAMissingFileAsDoneWhenToldSo) {
  EXPECT_TRUE(FetchFile(run(), "none.bin", "\\none.bin", OnFailedGet::kTakeAsDone));
  EXPECT_FALSE(Exists("\\none.bin"));
  EXPECT_EQ(server().received().size(), 1U);
  EXPECT_EQ(Sleeps(3000), 0U);
}

TEST_F(FetchTest, TriesAServerThatCannotBeReachedForEverWhateverItWasTold) {
  server().Put("a.bin", "content");
  server().port().StopAccepting();
  At(seconds(60), [this] { server().port().StartAccepting(); });
  EXPECT_TRUE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTakeAsDone));
  EXPECT_TRUE(Exists("\\a.bin"));
  EXPECT_GE(Sleeps(3000), 2U);
}

TEST_F(FetchTest, SurvivesAServerThatAnswersNonsense) {
  const std::string content(30000, 'c');
  server().Put("a.bin", content);
  server().TreatNext(1, test::AnswerWith("\x01\x02garbage", test::Afterwards::kEnd));
  EXPECT_TRUE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTryAgain));
  EXPECT_THAT(GetFile("\\a.bin"), Optional(content));
  EXPECT_EQ(server().received().size(), 2U);
}

TEST_F(FetchTest, SurvivesAServerThatBreaksOff) {
  const std::string content(30000, 'c');
  server().Put("a.bin", content);
  const std::string head = "HTTP/1.1 200 OK\r\nContent-Length: 30000\r\nContent-CRC32: 1\r\n\r\n";
  for (const auto afterwards : {test::Afterwards::kEnd, test::Afterwards::kReset}) {
    server().TreatNext(1, test::AnswerWith(head + "some", afterwards));
    EXPECT_TRUE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTryAgain));
    EXPECT_THAT(GetFile("\\a.bin"), Optional(content));
  }
}

TEST_F(FetchTest, MakesNoFolderForAFileInMemory) {
  EXPECT_TRUE(FetchFile(run(), "os.bin", "RAM:\\Sub\\os.bin", OnFailedGet::kTakeAsDone));
  EXPECT_EQ(device().faults().Count("CreateDirectoryW"), 0U);
}

TEST_F(FetchTest, FailsOnlyWithoutMemory) {
  RunOutOfMemory();
  EXPECT_FALSE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTryAgain)) << "for the client";
  device().faults().Clear();
  server().Put("a.bin", "content");
  EXPECT_TRUE(FetchFile(run(), "a.bin", "\\a.bin", OnFailedGet::kTryAgain));
  RunOutOfMemory();
  EXPECT_FALSE(FetchFile(run(), "a.bin", "\\b.bin", OnFailedGet::kTryAgain)) << "for the buffer";
  EXPECT_EQ(run().fetch_attempt, 2U);
}

// ---- the list file ----

class ListTest : public PhasesTest {
 protected:
  static constexpr char kList[] = "b/a.bin,\\a.bin,TQ5*,7,20\r\nb/c.bin,\\c.bin,*,9,30\r\n";

  void AddList(std::string_view crc) {
    job().AddMCFileList(test::MakeFile({"b/list.txt", "\\list.txt", "*", crc}));
  }
};

TEST_F(ListTest, IsTakenAsItIsWhenItsChecksumIsRight) {
  PutFile("\\list.txt", kList);
  AddList(test::CrcText(kList));

  LoadFileList(run());

  ASSERT_EQ(job().DownloadFiles().size(), 2U);
  const tagDownloadFile& first = *job().DownloadFiles()[0];
  EXPECT_STREQ(first.source, "b/a.bin");
  EXPECT_STREQ(first.destination, "\\a.bin");
  EXPECT_STREQ(first.masks, "TQ5*");
  EXPECT_STREQ(first.crc, "7");
  EXPECT_STREQ(first.size, "20");
  EXPECT_STREQ(job().DownloadFiles()[1]->source, "b/c.bin");
  EXPECT_EQ(ReadLog(),
            "Orvenix - LoadFileList - multicast list file crc match\r\n"
            "Orvenix - LoadFileList, src file = !b/list.txt!\r\n"
            "Orvenix - LoadFileList, dest file = !\\list.txt!\r\n"
            "Orvenix - LoadFileList, open for reading1 = !\\list.txt!\r\n");
}

TEST_F(ListTest, IsFetchedWhenItIsNotThere) {
  server().Put("b/list.txt", kList);
  AddList(test::CrcText(kList));

  LoadFileList(run());

  EXPECT_EQ(job().DownloadFiles().size(), 2U);
  EXPECT_THAT(LogLinesWith("LoadFileList"),
              ElementsAre("Orvenix - LoadFileList - multicast crc error, no file, \\list.txt",
                          "Orvenix - LoadFileList, src file = !b/list.txt!",
                          "Orvenix - LoadFileList, dest file = !\\list.txt!",
                          "Orvenix - LoadFileList, open for reading1 = !\\list.txt!",
                          "Orvenix - LoadFileList, open for reading2 = !\\list.txt!"));
}

TEST_F(ListTest, IsDeletedAndFetchedWhenItsChecksumIsWrong) {
  PutFile("\\list.txt", "old");
  server().Put("b/list.txt", kList);
  AddList("3421780262");  // of "123456789"

  LoadFileList(run());

  EXPECT_EQ(job().DownloadFiles().size(), 2U) << "and not compared again";
  EXPECT_EQ(LogLinesWith("mismatch").front(),
            "Orvenix - LoadFileList - multicast list file crc mismatch, \\list.txt, -873187034, " +
                std::to_string(static_cast<std::int32_t>(std::stoul(test::CrcText("old")))));
}

TEST_F(ListTest, WithoutAChecksumIsAlwaysFetchedUnlessItsOwnIsZero) {
  PutFile("\\list.txt", kList);
  server().Put("b/list.txt", kList);
  AddList("");
  LoadFileList(run());
  EXPECT_EQ(server().received().size(), 1U);

  PutFile("\\list.txt", "");  // its CRC-32 is 0
  LoadFileList(run());
  EXPECT_EQ(server().received().size(), 1U);
}

TEST_F(ListTest, LeavesTheJobAsItWasAfterThreeFailures) {
  AddList("1");
  RunOutOfMemory();
  LoadFileList(run());
  EXPECT_TRUE(job().DownloadFiles().empty());
  const std::string round =
      "Orvenix - LoadFileList, src file = !b/list.txt!\r\n"
      "Orvenix - LoadFileList, dest file = !\\list.txt!\r\n"
      "Orvenix - LoadFileList, open for reading1 = !\\list.txt!\r\n"
      "Orvenix - LoadFileList, error getting multicast list file\r\n";
  EXPECT_EQ(ReadLog(), "Orvenix - LoadFileList - multicast crc error, no file, \\list.txt\r\n" +
                           round + round + round +
                           "Orvenix - LoadFileList, error getting list file");
}

TEST_F(ListTest, IsNotSpokenOfWhenTheJobHasNone) {
  LoadFileList(run());
  EXPECT_EQ(ReadLog(), "");
}

TEST_F(ListTest, AddsBehindTheFilesThatTheJobHas) {
  job().AddDownloadFile(test::MakeFile({"own", "\\own"}));
  PutFile("\\list.txt", kList);
  AddList(test::CrcText(kList));
  LoadFileList(run());
  ASSERT_EQ(job().DownloadFiles().size(), 3U);
  EXPECT_STREQ(job().DownloadFiles()[0]->source, "own");
}

TEST_F(ListTest, OfAnyBytesIsSurvived) {
  std::string bytes;
  for (int i = 0; i < 5000; ++i) bytes += static_cast<char>(i * 37 % 256);
  PutFile("\\list.txt", bytes);
  AddList(test::CrcText(bytes));
  LoadFileList(run());
  const std::string with_long_field = std::string(3000, 'x') + ",a,b,1,2\r\n" + kList;
  PutFile("\\list.txt", with_long_field);
  AddList(test::CrcText(with_long_field));
  LoadFileList(run());
  EXPECT_GE(job().DownloadFiles().size(), 2U);
}

TEST_F(ListTest, StopsAtTheRecordThatThereIsNoMemoryFor) {
  PutFile("\\list.txt", kList);
  AddList(test::CrcText(kList));
  RunOutOfMemory(/*spared=*/5);  // checksum 2, bytes 1, the first record and its place
  LoadFileList(run());
  EXPECT_EQ(job().DownloadFiles().size(), 1U);
}

// ---- validation ----

class ValidationTest : public PhasesTest {
 protected:
  void Expect(const test::FileOfJob& file) { job().AddDownloadFile(test::MakeFile(file)); }
};

TEST_F(ValidationTest, LeavesARightFileAloneAndCountsItsSize) {
  PutFile("\\a.bin", "right");
  const std::string crc = test::CrcText("right");
  Expect({"a.bin", "\\a.bin", "*", crc, "5"});

  ValidateFiles(run());

  EXPECT_EQ(run().validated_bytes, 5U);
  EXPECT_THAT(server().received(), IsEmpty());
  EXPECT_THAT(StatusLines(), ElementsAre("Validating, \\a.bin"));
  EXPECT_EQ(ReadLog(),
            "Orvenix - ValidateFiles - Entering\r\n"
            "Orvenix - ValidateFiles - LoadFileList\r\n"
            "Orvenix - ValidateFiles - check file !\\a.bin!\r\n");
}

TEST_F(ValidationTest, FetchesAWrongFileAndSaysWhy) {
  PutFile("\\a.bin", "wrong");
  const std::string content(20000, 'r');
  const std::string crc = server().Put("dir/a.bin", content);
  Expect({"dir/a.bin", "\\a.bin", "*", crc, "20000"});

  ValidateFiles(run());

  EXPECT_THAT(GetFile("\\a.bin"), Optional(content));
  EXPECT_EQ(run().validated_bytes, 0U);
  const auto lines = LogLinesWith("ValidateFiles");
  ASSERT_EQ(lines.size(), 5U);
  EXPECT_EQ(lines[3],
            "Orvenix - ValidateFiles - crc mismatch, \\a.bin, " +
                std::to_string(static_cast<std::int32_t>(std::stoul(crc))) + ", " +
                std::to_string(static_cast<std::int32_t>(std::stoul(test::CrcText("wrong")))));
  EXPECT_EQ(lines[4], "Orvenix - ValidateFiles - http fetching !dir/a.bin! to !\\a.bin!");
  EXPECT_THAT(StatusLines(), ElementsAre("Validating, \\a.bin", "\\a.bin"));
}

TEST_F(ValidationTest, FetchesAMissingFile) {
  const std::string crc = server().Put("a.bin", "content");
  Expect({"a.bin", "\\New\\a.bin", "*", crc, "7"});
  ValidateFiles(run());
  EXPECT_THAT(GetFile("\\New\\a.bin"), Optional(std::string("content")));
  EXPECT_THAT(LogLinesWith("crc error"),
              ElementsAre("Orvenix - ValidateFiles - crc error, no file, \\New\\a.bin"));
}

TEST_F(ValidationTest, NeitherChecksNorFetchesAFileWithoutAChecksum) {
  Expect({"a.bin", "\\a.bin", "*", "0", "7"});
  Expect({"b.bin", "\\b.bin", "*", "none", "7"});
  ValidateFiles(run());
  EXPECT_THAT(server().received(), IsEmpty());
  EXPECT_THAT(LogLinesWith("check file"), IsEmpty());
}

TEST_F(ValidationTest, PassesOverFilesForOtherDevices) {
  Expect({"a.bin", "\\a.bin", "MR4* XX", "1", "7"});
  Expect({"b.bin", "\\b.bin", " ; ", "1", "7"});
  job().AddDownloadFile(nullptr);
  ValidateFiles(run());
  EXPECT_THAT(LogLinesWith("check file"), IsEmpty());
}

TEST_F(ValidationTest, LeavesTheMasksAsTheyAre) {
  PutFile("\\a.bin", "right");
  const std::string crc = test::CrcText("right");
  Expect({"a.bin", "\\a.bin", "MR4*;TQ5* XX", crc, "5"});
  ValidateFiles(run());
  EXPECT_STREQ(job().DownloadFiles()[0]->masks, "MR4*;TQ5* XX");
  EXPECT_EQ(run().validated_bytes, 5U);
}

TEST_F(ValidationTest, DoesNothingOnADeviceWithoutAManufacturerString) {
  test::SetMfgString(job(), "");
  Expect({"a.bin", "\\a.bin", "*", "1", "7"});
  ValidateFiles(run());
  EXPECT_EQ(ReadLog(), "Orvenix - ValidateFiles - Entering\r\n");
  EXPECT_THAT(StatusLines(), ElementsAre("No MCT on device"));
}

TEST_F(ValidationTest, ComparesChecksumsAboveTwoToThe31) {
  PutFile("\\a.bin", "123456789");
  Expect({"a.bin", "\\a.bin", "*", "3421780262", "9"});
  ValidateFiles(run());
  EXPECT_EQ(run().validated_bytes, 9U);
}

TEST_F(ValidationTest, TakesTheListFilesEntriesIn) {
  PutFile("\\a.bin", "right");
  const std::string list = "a.bin,\\a.bin,*," + test::CrcText("right") + ",5\r\n";
  PutFile("\\list.txt", list);
  job().AddMCFileList(test::MakeFile({"list.txt", "\\list.txt", "*", test::CrcText(list)}));
  ValidateFiles(run());
  EXPECT_EQ(run().validated_bytes, 5U);
}

TEST_F(ValidationTest, NotesThatAnImageComesWhenAFileInMemoryIsChecked) {
  Expect({"os.bin", "RAM:os.bin", "*", "0", "9"});
  ValidateFiles(run());
  EXPECT_FALSE(run().os_image) << "it is not checked without a checksum";

  Expect({"os.bin", "RAM:os.bin", "*", "1", "9"});
  RunOutOfMemory();
  ValidateFiles(run());
  EXPECT_TRUE(run().os_image);
}

TEST_F(ValidationTest, ComparesAFileInMemoryOverTheSizeThatTheJobNames) {
  device::SetRAMSize(1000);
  ASSERT_TRUE(device::InitRAMStore());
  {
    device::RAMFile file;
    ASSERT_TRUE(file.OpenForWriting("os.bin", false, 100));
    ASSERT_TRUE(file.Write("right and more", 14));
  }
  Expect({"os.bin", "RAM:os.bin", "*", test::CrcText("right"), "5"});
  ValidateFiles(run());
  EXPECT_TRUE(run().os_image);
  EXPECT_EQ(run().validated_bytes, 5U);
  EXPECT_THAT(server().received(), IsEmpty());
}

TEST_F(ValidationTest, FetchesAFileInMemoryThatIsWrongOrMissing) {
  device::SetRAMSize(1000);
  Expect({"os.bin", "RAM:os.bin", "*", server().Put("os.bin", "right"), "5"});
  ValidateFiles(run());
  EXPECT_THAT(ReadLog(), HasSubstr("Orvenix - ValidateFiles - crc error, no file, RAM:os.bin\r\n"));
  std::uint32_t crc = 0;
  EXPECT_EQ(device::RAMFILECRC32("os.bin", &crc, 5, "RAM:os.bin"), 0U);
  EXPECT_EQ(std::to_string(crc), test::CrcText("right"));
  EXPECT_EQ(run().validated_bytes, 0U);
  {
    device::RAMFile file;
    ASSERT_TRUE(file.OpenForWriting("os.bin", true, 0));
    ASSERT_TRUE(file.Write("w", 1));
  }
  ValidateFiles(run());
  EXPECT_THAT(ReadLog(), HasSubstr("Orvenix - ValidateFiles - crc mismatch, RAM:os.bin, "));
  EXPECT_EQ(server().RequestedPaths().size(), 2U);
}

TEST_F(ValidationTest, GoesOnWithTheNextFileWhenOneCannotBeFetched) {
  PutFile("\\b.bin", "right");
  const std::string crc = test::CrcText("right");
  Expect({"a.bin", "\\a.bin", "*", "1", "7"});
  Expect({"b.bin", "\\b.bin", "*", crc, "5"});
  // The first file takes two status lines and two blocks for its checksum; the client comes next.
  device().faults().Add({"LocalAlloc", 5, 1, ERROR_OUTOFMEMORY});
  ValidateFiles(run());
  EXPECT_FALSE(Exists("\\a.bin"));
  EXPECT_EQ(run().validated_bytes, 5U);
}

}  // namespace
}  // namespace upgrade
