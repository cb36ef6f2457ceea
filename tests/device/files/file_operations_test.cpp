#include <gmock/gmock.h>

#include <filesystem>
#include <optional>
#include <string>

#include "device/file.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "storage/storage.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace device {
namespace {

using test::AttributesOf;
using test::Exists;
using test::GetFile;
using test::PutFile;
using test::SetAttributesOf;
using ::testing::Optional;

class FileTest : public DeviceTest {
 protected:
  File file_;
};

TEST_F(FileTest, OpensForWritingNewEmptyAndForNobodyElse) {
  PutFile("\\a.txt", "old content");

  ASSERT_TRUE(file_.OpenFile("\\a.txt", true));
  EXPECT_TRUE(file_.is_open());
  EXPECT_EQ(file_.last_error(), 0U);
  EXPECT_FALSE(File().OpenForReading("\\a.txt", true));

  ASSERT_TRUE(file_.Close());
  EXPECT_THAT(GetFile("\\a.txt"), Optional(std::string()));
}

TEST_F(FileTest, OpensForReadingOnlyWhatExistsAndTogetherWithOtherReaders) {
  EXPECT_FALSE(file_.OpenFile("\\none.txt", false));
  EXPECT_EQ(file_.last_error(), ERROR_FILE_NOT_FOUND);
  EXPECT_FALSE(file_.is_open());

  PutFile("\\a.txt", "abc");
  ASSERT_TRUE(file_.OpenFile("\\a.txt", false));
  File other;
  EXPECT_TRUE(other.OpenFile("\\a.txt", false));
}

TEST_F(FileTest, KeepsTheContentForWritingWhenAskedTo) {
  EXPECT_FALSE(file_.OpenForWriting("\\a.txt", true, 0)) << "what is kept must exist";

  PutFile("\\a.txt", "abcdef");
  ASSERT_TRUE(file_.OpenForWriting("\\a.txt", true, 3));
  EXPECT_TRUE(file_.Write("XY", 2));
  file_.Close();
  EXPECT_THAT(GetFile("\\a.txt"), Optional(std::string("XYcdef")));

  ASSERT_TRUE(file_.OpenForWriting("\\a.txt", false, 1000));
  file_.Close();
  EXPECT_THAT(GetFile("\\a.txt"), Optional(std::string())) << "the size reserves nothing";
}

TEST_F(FileTest, TellsTheErrorOfCreatingAndNoneOfSuccess) {
  std::uint32_t error = 77;
  EXPECT_FALSE(file_.CreateForWriting("\\none\\a.txt", false, &error));
  EXPECT_EQ(error, ERROR_PATH_NOT_FOUND);
  EXPECT_TRUE(file_.CreateForWriting("\\a.txt", false, &error));
  EXPECT_EQ(error, 0U);
  EXPECT_TRUE(file_.CreateForWriting("\\a.txt", false, nullptr)) << "the earlier one is closed";
}

TEST_F(FileTest, SharesACreatedFileWithReadersWhenAskedTo) {
  PutFile("\\a.txt", "");
  ASSERT_TRUE(file_.CreateForWriting("\\a.txt", true, nullptr));
  HANDLE const reader =
      CreateFileW(TEXT("\\a.txt"), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                  OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  EXPECT_NE(reader, INVALID_HANDLE_VALUE);
  CloseHandle(reader);
}

TEST_F(FileTest, ReadsInPiecesToTheEnd) {
  PutFile("\\a.txt", "abcdefg");
  ASSERT_TRUE(file_.OpenForReading("\\a.txt", true));
  char buffer[4] = {};
  std::uint32_t read = 0;
  EXPECT_TRUE(file_.Read(buffer, 4, &read));
  EXPECT_EQ(std::string(buffer, read), "abcd");
  EXPECT_TRUE(file_.Read(buffer, 4, &read));
  EXPECT_EQ(std::string(buffer, read), "efg");
  EXPECT_TRUE(file_.Read(buffer, 4, &read));
  EXPECT_EQ(read, 0U);
}

TEST_F(FileTest, SeeksFromTheBeginningAndKnowsItsSize) {
  PutFile("\\a.txt", "abcdefg");
  ASSERT_TRUE(file_.OpenForReading("\\a.txt", true));
  std::uint32_t size = 0;
  EXPECT_TRUE(file_.GetSize(&size));
  EXPECT_EQ(size, 7U);
  EXPECT_TRUE(file_.Seek(5));
  char letter = 0;
  std::uint32_t read = 0;
  EXPECT_TRUE(file_.Read(&letter, 1, &read));
  EXPECT_EQ(letter, 'f');
}

TEST_F(FileTest, SeeksBeyondTwoGib) {
  ASSERT_TRUE(file_.OpenForWriting("\\a.txt", false, 0));

  EXPECT_TRUE(file_.Seek(0x7FFFFFFFU));
  EXPECT_TRUE(file_.Seek(0x80000000U));
  EXPECT_TRUE(file_.Seek(4294770690U));
  EXPECT_EQ(file_.last_error(), 0U);
}

TEST_F(FileTest, FailsInEveryOperationOnAClosedFile) {
  char letter = 0;
  std::uint32_t number = 9;
  FILETIME time = {};
  EXPECT_FALSE(file_.Close());
  EXPECT_FALSE(file_.Read(&letter, 1, &number));
  EXPECT_EQ(number, 0U);
  EXPECT_FALSE(file_.Write("x", 1));
  EXPECT_FALSE(file_.Seek(0));
  EXPECT_FALSE(file_.GetSize(&number));
  EXPECT_FALSE(file_.Flush());
  EXPECT_FALSE(file_.GetTime(TimeKind::kLastWrite, &time));
  EXPECT_FALSE(file_.FindNext());
  EXPECT_FALSE(file_.FindClose());
}

TEST_F(FileTest, ClosesTwiceWithoutHarm) {
  ASSERT_TRUE(file_.OpenFile("\\a.txt", true));
  EXPECT_TRUE(file_.Flush());
  EXPECT_TRUE(file_.Close());
  EXPECT_FALSE(file_.Close());
}

TEST_F(FileTest, RefusesNamesThatDoNotFit) {
  const std::string long_name = "\\" + std::string(259, 'x');
  EXPECT_FALSE(file_.OpenFile(long_name.c_str(), true));
  EXPECT_EQ(file_.last_error(), ERROR_INVALID_NAME);
  EXPECT_FALSE(file_.OpenFile(nullptr, true));
  EXPECT_FALSE(file_.DeleteFile(long_name.c_str(), nullptr));
  EXPECT_FALSE(file_.CreateDirectory(long_name.c_str()));
  EXPECT_FALSE(file_.FindFirst(long_name.c_str()));
  EXPECT_FALSE(file_.MoveFile("\\a", long_name.c_str()));
  EXPECT_FALSE(file_.CopyFile(long_name.c_str(), "\\a", false));
}

TEST_F(FileTest, ReadsAndSetsEachTimeInBothForms) {
  ASSERT_TRUE(file_.OpenFile("\\a.txt", true));
  const SYSTEMTIME moment = {2006, 3, 3, 1, 14, 5, 9, 0};
  for (const TimeKind kind : {TimeKind::kCreation, TimeKind::kLastWrite}) {
    EXPECT_TRUE(file_.SetTime(kind, moment));
    SYSTEMTIME parts = {};
    EXPECT_TRUE(file_.GetTime(kind, &parts));
    EXPECT_EQ(parts.wYear, 2006);
    EXPECT_EQ(parts.wMonth, 3);
    EXPECT_EQ(parts.wHour, 14);
    FILETIME time = {};
    EXPECT_TRUE(file_.GetTime(kind, &time));
    EXPECT_TRUE(file_.SetTime(kind, time));
  }
  FILETIME access = {};
  EXPECT_TRUE(file_.GetTime(TimeKind::kLastAccess, &access));
  const SYSTEMTIME impossible = {2006, 13, 0, 1, 0, 0, 0, 0};
  EXPECT_FALSE(file_.SetTime(TimeKind::kLastWrite, impossible));
}

TEST_F(FileTest, FormatsATimeAsLocalDateAndTime) {
  const SYSTEMTIME moment = {2006, 3, 3, 1, 14, 5, 9, 0};
  FILETIME time = {};
  ASSERT_NE(SystemTimeToFileTime(&moment, &time), 0);
  char text[64];
  EXPECT_TRUE(file_.FormatFileTime(time, text, sizeof text));
  EXPECT_STREQ(text, "3/1/2006 2:05:09 PM");
  char cut[9];
  EXPECT_TRUE(file_.FormatFileTime(time, cut, sizeof cut));
  EXPECT_STREQ(cut, "3/1/2006");
}

class FileOfAnotherZoneTest : public DeviceTest {
 protected:
  static sim::Profile Eastern() {
    sim::Profile profile;
    profile.utc_offset_minutes = 60;
    return profile;
  }
  FileOfAnotherZoneTest() : DeviceTest(Eastern()) {}
};

TEST_F(FileOfAnotherZoneTest, FormatsATimeInTheDevicesZone) {
  const SYSTEMTIME moment = {2006, 3, 2, 28, 23, 30, 0, 0};
  FILETIME time = {};
  ASSERT_NE(SystemTimeToFileTime(&moment, &time), 0);
  char text[64];
  EXPECT_TRUE(File().FormatFileTime(time, text, sizeof text));
  EXPECT_STREQ(text, "3/29/2006 12:30:00 AM");
}

TEST_F(FileTest, ComparesTheOpenFilesTimeWithAnothers) {
  const SYSTEMTIME early = {2006, 1, 0, 1, 0, 0, 0, 0};
  const SYSTEMTIME late = {2007, 1, 1, 1, 0, 0, 0, 0};
  File other;
  ASSERT_TRUE(other.OpenFile("\\late.txt", true));
  ASSERT_TRUE(other.SetTime(TimeKind::kLastWrite, late));
  other.Close();
  ASSERT_TRUE(file_.OpenFile("\\early.txt", true));
  ASSERT_TRUE(file_.SetTime(TimeKind::kLastWrite, early));

  EXPECT_EQ(file_.CompareFileTimes("\\late.txt"), -1);
  ASSERT_TRUE(file_.SetTime(TimeKind::kLastWrite, late));
  EXPECT_EQ(file_.CompareFileTimes("\\late.txt"), 0);
  file_.Close();
  ASSERT_TRUE(file_.OpenForReading("\\late.txt", true));
  EXPECT_EQ(file_.CompareFileTimes("\\none.txt"), -1) << "what cannot be opened counts as newer";
}

TEST_F(FileTest, ComparesTheFoundFilesTimeWhenNoneIsOpen) {
  const SYSTEMTIME early = {2006, 1, 0, 1, 0, 0, 0, 0};
  ASSERT_TRUE(file_.OpenFile("\\early.txt", true));
  ASSERT_TRUE(file_.SetTime(TimeKind::kLastWrite, early));
  file_.Close();
  PutFile("\\now.txt", "x");

  ASSERT_TRUE(file_.FindFirst("\\now.txt"));
  EXPECT_EQ(file_.CompareFileTimes("\\early.txt"), 1);
}

TEST_F(FileTest, DeletesAReadOnlyFile) {
  PutFile("\\a.txt", "x");
  SetAttributesOf("\\a.txt", FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_SYSTEM);
  std::uint32_t error = 77;
  EXPECT_TRUE(file_.DeleteFile("\\a.txt", &error));
  EXPECT_EQ(error, 0U);
  EXPECT_FALSE(Exists("\\a.txt"));
  EXPECT_FALSE(file_.DeleteFile("\\a.txt", &error));
  EXPECT_EQ(error, ERROR_FILE_NOT_FOUND);
}

TEST_F(FileTest, ReadsAndSetsAttributes) {
  EXPECT_EQ(file_.GetAttributes("\\a.txt"), INVALID_FILE_ATTRIBUTES);
  PutFile("\\a.txt", "x");
  EXPECT_TRUE(file_.SetAttributes("\\a.txt", FILE_ATTRIBUTE_HIDDEN));
  EXPECT_NE(file_.GetAttributes("\\a.txt") & FILE_ATTRIBUTE_HIDDEN, 0U);
  EXPECT_FALSE(file_.SetAttributes("\\none.txt", FILE_ATTRIBUTE_HIDDEN));
}

TEST_F(FileTest, WalksAFolder) {
  PutFile("\\Temp\\one.txt", "1");
  PutFile("\\Temp\\Sub\\deep.txt", "2");
  std::vector<std::string> files;
  std::vector<std::string> folders;
  for (bool more = file_.FindFirst("\\Temp\\*.*"); more; more = file_.FindNext()) {
    (file_.IsDirectory(file_.found()) ? folders : files).emplace_back(file_.found_name());
  }
  EXPECT_THAT(files, ::testing::ElementsAre("one.txt"));
  EXPECT_THAT(folders, ::testing::ElementsAre("Sub"));
  EXPECT_EQ(file_.last_error(), ERROR_NO_MORE_FILES);
  EXPECT_TRUE(file_.FindClose());
  EXPECT_FALSE(file_.FindClose());
}

TEST_F(FileTest, CopiesAndMovesWithoutReplacingUnlessAsked) {
  PutFile("\\a.txt", "a");
  PutFile("\\b.txt", "b");
  EXPECT_FALSE(file_.CopyFile("\\a.txt", "\\b.txt", true));
  EXPECT_TRUE(file_.CopyFile("\\a.txt", "\\b.txt", false));
  EXPECT_THAT(GetFile("\\b.txt"), Optional(std::string("a")));
  PutFile("\\c.txt", "c");
  EXPECT_FALSE(file_.MoveFile("\\a.txt", "\\c.txt"));
  EXPECT_TRUE(file_.MoveFile("\\a.txt", "\\d.txt"));
  EXPECT_FALSE(Exists("\\a.txt"));
}

TEST_F(FileTest, AsksForTheSpaceThatTheCallerMayUse) {
  std::uint64_t bytes = 0;
  EXPECT_TRUE(file_.GetFreeSpace("\\", &bytes));
  EXPECT_GT(bytes, 0U);
  device().faults().Add({"GetDiskFreeSpaceExW", 1, 1, ERROR_PATH_NOT_FOUND});
  EXPECT_FALSE(file_.GetFreeSpace("\\", &bytes));
  EXPECT_EQ(bytes, 0U);
  EXPECT_EQ(file_.last_error(), ERROR_PATH_NOT_FOUND);
}

TEST_F(FileTest, ClosesWhatItHoldsWhenItEnds) {
  PutFile("\\a.txt", "a");
  {
    const LocalObject<File> file(new File);
    ASSERT_TRUE(file);
    ASSERT_TRUE(file->FindFirst("\\*.*"));
    ASSERT_TRUE(file->OpenFile("\\a.txt", true));
  }
  EXPECT_TRUE(file_.OpenFile("\\a.txt", true));
}

TEST_F(FileTest, ExistsWhenThereIsAFileOrFolderOfThatName) {
  PutFile("\\Temp\\a.txt", "a");
  for (const char* path : {"\\Temp\\a.txt", "\\TEMP", "\\Temp\\*.txt"}) {
    EXPECT_TRUE(file_.Exists(path)) << path;
  }
  const std::string longest = "\\" + std::string(260, 'x');
  for (const char* path : {"\\Temp\\b.txt", "\\None\\a.txt", "", "\\", "\\Temp\\*.bin",
                           static_cast<const char*>(nullptr), longest.c_str()}) {
    EXPECT_FALSE(file_.Exists(path)) << base::View(path);
  }
}

TEST_F(FileTest, LeavesItsSearchOpenWhenItLooksForAName) {
  PutFile("\\Temp\\a.txt", "a");
  PutFile("\\Temp\\b.txt", "b");
  ASSERT_TRUE(file_.FindFirst("\\Temp\\*.*"));
  const std::size_t before = device().kernel().OpenHandles();
  EXPECT_TRUE(file_.Exists("\\Temp\\b.txt"));
  EXPECT_STREQ(file_.found_name(), "a.txt");
  EXPECT_TRUE(file_.FindNext());
  EXPECT_EQ(device().kernel().OpenHandles(), before);
}

TEST_F(FileTest, KnowsTheOneSizeThatLooksLikeAFailure) {
  PutFile("\\a.bin", "");
  std::filesystem::resize_file(device().storage().HostPath(TEXT("\\a.bin")).value(), 0xFFFFFFFFU);
  ASSERT_TRUE(file_.OpenForReading("\\a.bin", true));
  std::uint32_t size = 0;
  SetLastError(ERROR_GEN_FAILURE);
  EXPECT_TRUE(file_.GetSize(&size));
  EXPECT_EQ(size, 0xFFFFFFFFU);
  EXPECT_EQ(file_.last_error(), 0U);
  file_.Close();
  EXPECT_FALSE(file_.GetSize(&size));
  EXPECT_EQ(size, 0U);
}

}  // namespace
}  // namespace device
