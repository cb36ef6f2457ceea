// What happens to a device before files arrive: passes, storage, memory.
#include <gmock/gmock.h>

#include <memory>
#include <optional>
#include <string>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/system.h"
#include "device/flash/ram_file.h"
#include "faults/faults.h"
#include "kernel/debug.h"
#include "kernel/kernel.h"
#include "product_support/jobs.h"
#include "support/device_files.h"
#include "support/device_test.h"
#include "upgrade/file_lists.h"
#include "upgrade/memory_division.h"
#include "upgrade/pass_state.h"
#include "upgrade/paths.h"
#include "upgrade/ram_allocation.h"
#include "upgrade/storage_card.h"
#include "upgrade/storage_check.h"

namespace upgrade {
namespace {

using test::Exists;
using test::GetFile;
using test::PutFile;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::Optional;

class PreparationTest : public DeviceTest {
 protected:
  explicit PreparationTest(const sim::Profile& profile = WithCards())
      : DeviceTest(profile), job_(std::make_unique<UpgradeConfig>()) {}

  static sim::Profile WithCards() {
    sim::Profile profile;
    profile.volumes = {{"\\SDMMC Disk", 1000000, true}, {"\\Flash File Store", 1000000, true}};
    return profile;
  }

  [[nodiscard]] static std::string Log() { return GetFile("\\FileXfer.log").value_or(""); }

  UpgradeConfig& job() { return *job_; }

 private:
  std::unique_ptr<UpgradeConfig> job_;
};

// ---- passes ----

using PassTest = PreparationTest;

TEST_F(PassTest, OfASinglePassJobIsOneWithoutAFile) {
  EXPECT_EQ(ReadPass(job()), 1);
  EXPECT_EQ(device().faults().Count("CreateFileW"), 0U);
}

TEST_F(PassTest, OfAJobWithoutAFileIsZero) {
  test::SetMultiPass(job());
  EXPECT_EQ(ReadPass(job()), 0);
  EXPECT_TRUE(device().kernel().Sleeps().empty()) << "the pause belongs to a file that exists";
}

TEST_F(PassTest, IsReadFromTheFilesFirstTwentyBytes) {
  test::SetMultiPass(job());
  PutFile("\\kvoupgclnt.txt", "3");
  EXPECT_EQ(ReadPass(job()), 3);
  const auto sleeps = device().kernel().Sleeps();
  ASSERT_EQ(sleeps.size(), 1U);
  EXPECT_EQ(sleeps[0].length_ms, 500U);

  PutFile("\\kvoupgclnt.txt", "                   7123");
  EXPECT_EQ(ReadPass(job()), 7) << "the twentieth byte is the last that counts";
  PutFile("\\kvoupgclnt.txt", "nonsense");
  EXPECT_EQ(ReadPass(job()), 0);
  PutFile("\\kvoupgclnt.txt", "");
  EXPECT_EQ(ReadPass(job()), 0);
}

TEST_F(PassTest, IsWrittenAsPlainDigits) {
  PutFile("\\kvoupgclnt.txt", "longer than the number");
  WritePass(job(), 12);
  EXPECT_THAT(GetFile("\\kvoupgclnt.txt"), Optional(std::string("12")));
}

TEST_F(PassTest, IsKeptInTheFlashByFamiliesThatBeginWithSeven) {
  test::SetFamily(job(), "7xx");
  WritePass(job(), 2);
  EXPECT_THAT(GetFile("\\Flash File Store\\kvoupgclnt.txt"), Optional(std::string("2")));
  EXPECT_FALSE(Exists("\\kvoupgclnt.txt"));
}

TEST_F(PassTest, GoesUpByOneWithEachRun) {
  test::SetMultiPass(job());
  EXPECT_EQ(BeginPass(job()), 1);
  EXPECT_THAT(GetFile("\\kvoupgclnt.txt"), Optional(std::string("1")));
  EXPECT_EQ(BeginPass(job()), 2);
  EXPECT_THAT(GetFile("\\kvoupgclnt.txt"), Optional(std::string("2")));
}

TEST_F(PassTest, WrapsInADamagedFile) {
  test::SetMultiPass(job());
  PutFile("\\kvoupgclnt.txt", "2147483647");
  EXPECT_EQ(BeginPass(job()), -2147483647 - 1);
}

TEST_F(PassTest, OfASinglePassJobIsOneAndStoresZero) {
  PutFile("\\kvoupgclnt.txt", "5");
  test::SetAttributesOf("\\kvoupgclnt.txt", 1);
  EXPECT_EQ(BeginPass(job()), 1);
  EXPECT_THAT(GetFile("\\kvoupgclnt.txt"), Optional(std::string("0")));
}

TEST_F(PassTest, LeavesOutPackagesOfOtherPasses) {
  FirmwarePackage package;
  base::CopyText(package.additional_parameters, "Pass=2");
  EXPECT_TRUE(IsInPass(job(), package, 1)) << "a job of one pass takes every package";
  test::SetMultiPass(job());
  EXPECT_FALSE(IsInPass(job(), package, 1));
  EXPECT_TRUE(IsInPass(job(), package, 2));
  base::CopyText(package.additional_parameters, "Pass=0");
  for (int pass = 1; pass <= 9; ++pass) EXPECT_FALSE(IsInPass(job(), package, pass));
  base::CopyText(package.additional_parameters, "");
  EXPECT_TRUE(IsInPass(job(), package, 1));
}

// ---- space ----

using SpaceTest = PreparationTest;

TEST_F(SpaceTest, IsMissingWithoutRequirements) {
  std::uint32_t total = 77;
  EXPECT_FALSE(CheckSpace(job(), &total));
  EXPECT_EQ(total, 0U);
}

TEST_F(SpaceTest, IsThereWhenTheLastRequirementIsMet) {
  test::AddStore(job(), "\\", "2000000000");
  test::AddStore(job(), "RAM:", "30");
  std::uint32_t total = 0;
  EXPECT_TRUE(CheckSpace(job(), &total));
  EXPECT_EQ(total, 2000000030U);
}

TEST_F(SpaceTest, IsMissingWhenTheLastRequirementIsNotMet) {
  test::AddStore(job(), "RAM:", "30");
  test::AddStore(job(), "\\", "2000000000");
  std::uint32_t total = 0;
  EXPECT_FALSE(CheckSpace(job(), &total));
}

TEST_F(SpaceTest, LogsEveryRequirementButThoseInMemory) {
  test::AddStore(job(), "\\", "1");
  test::AddStore(job(), "RAM:os", "2");
  test::AddStore(job(), "\\SDMMC Disk", "3");
  std::uint32_t total = 0;
  EXPECT_TRUE(CheckSpace(job(), &total));
  EXPECT_EQ(Log(),
            "Orvenix - CheckSpace, \\\r\n"
            "Orvenix - CheckSpace, \\SDMMC Disk\r\n");
  EXPECT_EQ(total, 6U);
}

TEST_F(SpaceTest, MustBeMoreThanAskedFor) {
  ULARGE_INTEGER free_bytes = {};
  ASSERT_NE(GetDiskFreeSpaceExW(u"\\SDMMC Disk", nullptr, nullptr, &free_bytes), 0);
  const std::string exact = std::to_string(free_bytes.QuadPart);
  const std::string less = std::to_string(free_bytes.QuadPart - 1);
  std::uint32_t total = 0;
  test::AddStore(job(), "\\SDMMC Disk", exact);
  EXPECT_FALSE(CheckSpace(job(), &total));
  test::AddStore(job(), "\\SDMMC Disk", less);
  EXPECT_TRUE(CheckSpace(job(), &total));
}

TEST_F(SpaceTest, OfTheRootIsThatOfStoreAndProgramsTogether) {
  MEMORYSTATUS memory = {};
  memory.dwLength = sizeof memory;
  GlobalMemoryStatus(&memory);
  STORE_INFORMATION store = {};
  ASSERT_NE(GetStoreInformation(&store), 0);
  std::uint32_t total = 0;
  test::AddStore(job(), "\\", std::to_string(store.dwFreeSize + memory.dwAvailPhys / 2));
  EXPECT_TRUE(CheckSpace(job(), &total)) << "more than the store alone has";
}

TEST_F(SpaceTest, OfAVolumeThatDoesNotAnswerIsMissingAndNotCounted) {
  test::AddStore(job(), "RAM:", "5");
  test::AddStore(job(), "\\", "7");
  device().faults().Add({"GetDiskFreeSpaceExW", 1, 1, ERROR_PATH_NOT_FOUND});
  std::uint32_t total = 0;
  EXPECT_FALSE(CheckSpace(job(), &total)) << "the root is asked, too";
  EXPECT_EQ(total, 5U);
}

TEST_F(SpaceTest, NeverSufficesForASizeWithItsTopBitSet) {
  test::AddStore(job(), "\\", "-1");
  std::uint32_t total = 0;
  EXPECT_FALSE(CheckSpace(job(), &total));
  EXPECT_EQ(total, 0xFFFFFFFFU);
  test::AddStore(job(), "\\", "3000000000");
  EXPECT_FALSE(CheckSpace(job(), &total));
}

TEST_F(SpaceTest, PassesOverRequirementsThatAreNotThere) {
  test::AddStore(job(), "RAM:", "5");
  job().AddStorageReqEntry(nullptr);
  std::uint32_t total = 0;
  EXPECT_TRUE(CheckSpace(job(), &total));
}

TEST_F(SpaceTest, TakesTheNameOfTheMemoryStoreInExactCase) {
  test::AddStore(job(), "ram:", "5");
  std::uint32_t total = 0;
  CheckSpace(job(), &total);
  EXPECT_THAT(Log(), HasSubstr("CheckSpace, ram:"));
}

// ---- storage cards ----

class CardTest : public PreparationTest {
 protected:
  void SetUp() override { PutFile("\\SDMMC Disk\\SubFolder\\x", ""); }
};

TEST_F(CardTest, ServesAPackageThatNeedsItAndFits) {
  test::AddPackage(job(), {0, "os.bin", "", "", "", "DiskSize=\\SDMMC Disk:5000"});
  EXPECT_TRUE(FindStorageCard(job(), 1, "\\SDMMC Disk"));
  EXPECT_FALSE(FindStorageCard(job(), 1, "\\Storage Card"));
  EXPECT_TRUE(ProbeStorageCards(job(), 1));
}

TEST_F(CardTest, DoesNotServeAPackageThatIsTooLarge) {
  test::AddPackage(job(), {0, "os.bin", "", "", "", "DiskSize=\\SDMMC Disk:1000000"});
  EXPECT_FALSE(ProbeStorageCards(job(), 1));
}

TEST_F(CardTest, IsNotNeededWithoutASize) {
  test::AddPackage(job(), {0, "os.bin", "", "", "", ""});
  test::AddPackage(job(), {0, "os.bin", "", "", "", "DiskSize=\\SDMMC Disk:0"});
  EXPECT_FALSE(ProbeStorageCards(job(), 1));
}

TEST_F(CardTest, ServesOnlyPackagesOfThisPass) {
  test::SetMultiPass(job());
  test::AddPackage(job(), {0, "os.bin", "", "", "", "Pass=2,DiskSize=\\SDMMC Disk:5000"});
  EXPECT_FALSE(ProbeStorageCards(job(), 1));
  EXPECT_TRUE(ProbeStorageCards(job(), 2));
}

TEST_F(CardTest, OfAnyNameIsMeasuredByTheSameFolders) {
  test::AddPackage(job(), {0, "os.bin", "", "", "", "DiskSize=\\SD Card:5000"});
  EXPECT_TRUE(FindStorageCard(job(), 1, "\\SD Card"))
      << "there is no such card; the other one's room counts";
}

TEST_F(CardTest, IsMeasuredByTheSecondFolderWhenTheFirstDoesNotAnswer) {
  test::AddPackage(job(), {0, "os.bin", "", "", "", "DiskSize=\\SD Card:5000"});
  device().faults().Add({"GetDiskFreeSpaceExW", 1, 1, ERROR_PATH_NOT_FOUND});
  static_cast<void>(FindStorageCard(job(), 1, "\\SD Card"));
  EXPECT_EQ(device().faults().Count("GetDiskFreeSpaceExW"), 2U);
}

TEST_F(CardTest, IsTriedForTheNextPackageWhenNeitherFolderAnswers) {
  test::AddPackage(job(), {0, "a.bin", "", "", "", "DiskSize=\\SDMMC Disk:5000"});
  test::AddPackage(job(), {0, "b.bin", "", "", "", "DiskSize=\\SDMMC Disk:6000"});
  device().faults().Add({"GetDiskFreeSpaceExW", 1, 2, ERROR_PATH_NOT_FOUND});
  EXPECT_TRUE(FindStorageCard(job(), 1, "\\SDMMC Disk"));
}

TEST_F(CardTest, IsNeverLargeEnoughForASizeWithItsTopBitSet) {
  test::AddPackage(job(), {0, "a.bin", "", "", "", "DiskSize=\\SDMMC Disk:3000000000"});
  EXPECT_FALSE(ProbeStorageCards(job(), 1));
}

// ---- memory ----

using MemoryTest = PreparationTest;

TEST_F(MemoryTest, IsDividedAsTheFractionSays) {
  DWORD store = 0;
  DWORD ram = 0;
  DWORD page = 0;
  ASSERT_NE(GetSystemMemoryDivision(&store, &ram, &page), 0);
  const DWORD total = store + ram;

  EXPECT_TRUE(SetMemoryDivision(0.5));

  ASSERT_NE(GetSystemMemoryDivision(&store, &ram, &page), 0);
  EXPECT_EQ(store + ram, total);
  EXPECT_LT(store, 24576U) << "the profile gives the store three quarters";
}

TEST_F(MemoryTest, IsLeftAloneWhenThePlatformDoesNotTell) {
  device().faults().Add({"GetSystemMemoryDivision", 1, 1, 0});
  EXPECT_FALSE(SetMemoryDivision(0.5));
  device().faults().Add({"GetStoreInformation", 1, 1, 0});
  EXPECT_FALSE(SetMemoryDivision(0.5));
  EXPECT_EQ(device().faults().Count("SetSystemMemoryDivision"), 0U);
}

TEST_F(MemoryTest, IsNotDividedWhenThePlatformRefuses) {
  device().faults().Add({"SetSystemMemoryDivision", 1, 1, 0});
  EXPECT_FALSE(SetMemoryDivision(0.5));
}

TEST_F(MemoryTest, ForTheDriverIsTheFirstRequirementsAndALittleMore) {
  test::AddStore(job(), "\\", "1");
  test::AddStore(job(), "RAM:a", "16777216");
  test::AddStore(job(), "RAM:b", "5");
  InitRam(job());
  EXPECT_EQ(Log(), "Orvenix - InitRAM - RAM needed = 16777216\r\n");
  EXPECT_TRUE(device::HasRAMStore());
  EXPECT_THAT(device().debug().KernelText(), HasSubstr("Allocated 16818176 Bytes!\r\n"));

  InitRam(job());
  EXPECT_THAT(Log(), Not(HasSubstr("error"))) << "the next job finds it";
}

TEST_F(MemoryTest, ForTheDriverMayNotBeThere) {
  test::AddStore(job(), "RAM:a", "1000000000");
  InitRam(job());
  EXPECT_EQ(Log(),
            "Orvenix - InitRAM - RAM needed = 1000000000\r\n"
            "Orvenix - InitRAM - RAM init error = 1000000000\r\n");
  EXPECT_FALSE(device::HasRAMStore());
}

TEST_F(MemoryTest, ForTheDriverIsNotSpokenOfWithoutARequirement) {
  test::AddStore(job(), "\\", "1");
  InitRam(job());
  EXPECT_EQ(Log(), "");
}

TEST_F(MemoryTest, ForAnImageIsThatOfTheFirstPackageThatNamesIt) {
  test::SetMultiPass(job());
  test::AddPackage(job(), {0, "a", "", "", "", "Pass=2,RAMAllocSize=5"});
  test::AddPackage(job(), {0, "b", "", "", "", "RAMAllocSize=0"});
  upgrade::Run run(job());
  ReadRamAllocation(run);
  EXPECT_FALSE(run.os_image);
  run.pass = 2;
  ReadRamAllocation(run);
  EXPECT_TRUE(run.os_image);
  EXPECT_FALSE(device::HasRAMStore()) << "the first file makes it";
  EXPECT_TRUE(device::InitRAMStore());
  EXPECT_THAT(device().debug().KernelText(), HasSubstr("Allocated 40965 Bytes!\r\n"));
}

TEST_F(MemoryTest, ForAnImageMayBeAnyNumberButZero) {
  for (const char* size : {"-5", "2147483647", "4294967295", "-2147483648"}) {
    auto one = std::make_unique<UpgradeConfig>();
    const std::string options = std::string("RAMAllocSize=") + size;
    test::AddPackage(*one, {0, "a", "", "", "", options});
    upgrade::Run run(*one);
    ReadRamAllocation(run);
    EXPECT_TRUE(run.os_image) << size;
  }
}

// ---- folders and names ----

using FolderTest = PreparationTest;

TEST_F(FolderTest, OfAFileIsMadeWithItsParents) {
  CreateFolderOf("\\One\\Two\\Three\\file.bin");
  EXPECT_TRUE(Exists("\\One\\Two\\Three"));
  CreateFolderOf("\\One\\Four\\file.bin");
  EXPECT_TRUE(Exists("\\One\\Four"));
  CreateFolderOf("\\One\\Two\\Three\\file.bin");
}

TEST_F(FolderTest, IsNotMadeInTheRoot) {
  const auto before = device().faults().Count("CreateDirectoryW");
  CreateFolderOf("\\file.bin");
  CreateFolderOf("file.bin");
  CreateFolderOf("");
  CreateFolderOf("\\\\file.bin");
  EXPECT_EQ(device().faults().Count("CreateDirectoryW"), before);
}

TEST_F(FolderTest, StopsAtAFileInItsWay) {
  PutFile("\\One", "a file");
  CreateFolderOf("\\One\\Two\\file.bin");
  EXPECT_FALSE(Exists("\\One\\Two"));
  EXPECT_THAT(GetFile("\\One"), Optional(std::string("a file")));
}

TEST_F(FolderTest, IsMadeNextTimeWhenOneInTheMiddleCouldNotBe) {
  for (std::uint64_t nth = 1; nth <= 5; ++nth) {
    device().faults().Add({"CreateDirectoryW", nth, 1, ERROR_DISK_FULL});
    const std::string top = "\\t" + std::to_string(nth);
    CreateFolderOf(top + "\\Two\\Three\\file.bin");
    device().faults().Clear();
    CreateFolderOf(top + "\\Two\\Three\\file.bin");
    EXPECT_TRUE(Exists(top + "\\Two\\Three")) << nth;
  }
}

TEST_F(FolderTest, OfAnyDepthIsMade) {
  std::string path;
  for (int depth = 0; depth < 100; ++depth) path += "\\d";
  CreateFolderOf(path + "\\f");
  EXPECT_TRUE(Exists(path));
  CreateFolderOf(std::string(5000, '\\'));
  CreateFolderOf(std::string(5000, 'x') + "\\f");
}

using RenameTest = PreparationTest;

TEST_F(RenameTest, MovesFilesThatEndInRename) {
  PutFile("\\Temp\\settings.xml.rename", "new");
  PutFile("\\other.xml", "other");
  job().AddDownloadFile(test::MakeFile({"a", "\\Temp\\settings.xml.rename", "XX*"}));
  job().AddDownloadFile(test::MakeFile({"b", "\\other.xml"}));
  job().AddDownloadFile(nullptr);

  ApplyRenames(job());

  EXPECT_THAT(GetFile("\\Temp\\settings.xml"), Optional(std::string("new")))
      << "whatever devices the file is for";
  EXPECT_FALSE(Exists("\\Temp\\settings.xml.rename"));
  EXPECT_THAT(GetFile("\\other.xml"), Optional(std::string("other")));
}

TEST_F(RenameTest, NeverReplacesAFile) {
  PutFile("\\a.xml.rename", "new");
  PutFile("\\a.xml", "old");
  job().AddDownloadFile(test::MakeFile({"a", "\\a.xml.rename"}));
  ApplyRenames(job());
  EXPECT_THAT(GetFile("\\a.xml"), Optional(std::string("old")));
  EXPECT_THAT(GetFile("\\a.xml.rename"), Optional(std::string("new")));
}

TEST_F(RenameTest, ComparesTheEndingInItsExactCase) {
  PutFile("\\a.xml.RENAME", "new");
  job().AddDownloadFile(test::MakeFile({"a", "\\a.xml.RENAME"}));
  ApplyRenames(job());
  EXPECT_TRUE(Exists("\\a.xml.RENAME"));
  EXPECT_FALSE(Exists("\\a.xml"));
}

TEST_F(RenameTest, PassesOverWhatIsNotThere) {
  job().AddDownloadFile(test::MakeFile({"a", "\\none.rename"}));
  job().AddDownloadFile(test::MakeFile({"a", ".rename"}));
  job().AddDownloadFile(test::MakeFile({"a", "RAM:x.rename"}));
  ApplyRenames(job());
  EXPECT_FALSE(Exists("\\none"));
}

}  // namespace
}  // namespace upgrade
