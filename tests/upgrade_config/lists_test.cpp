// The job's lists: what they keep, own and free, with and without memory.
#include "upgrade_config/upgrade_config_test.h"

namespace test {
namespace {

using ::testing::ElementsAre;

TEST_F(UpgradeConfigTest, KeepsCopiesOfTextsInTheOrderInWhichTheyCame) {
  UpgradeConfig job;
  char text[] = "\\first";
  job.AddFileSave(text);
  text[1] = 'F';
  job.AddFileSave(nullptr);
  job.AddFileSave(std::string(5000, 'l').c_str());
  job.AddFileDelete("\\d");
  job.AddStopProcess("a.exe");
  job.AddStopProcess("a.exe");

  EXPECT_THAT(Texts(job.FilesToSave()), ElementsAre("\\first", "", std::string(5000, 'l')));
  EXPECT_THAT(Texts(job.FilesToDelete()), ElementsAre("\\d"));
  EXPECT_THAT(Texts(job.ProcessesToStop()), ElementsAre("a.exe", "a.exe"));
}

TEST_F(UpgradeConfigTest, KeepsTheRecordsThemselves) {
  UpgradeConfig job;
  auto* const file = NewRecord<tagDownloadFile>();
  auto* const store = NewRecord<tagStorageReq>();
  auto* const test = NewRecord<tagRegistryTest>();
  auto* const package = new FirmwarePackage;
  auto* const list = NewRecord<tagDownloadFile>();
  job.AddDownloadFile(file);
  job.AddStorageReqEntry(store);
  job.AddRegistryTest(test);
  job.AddRegistryTest(nullptr);
  job.AddFirmwarePkg(package);
  job.AddMCFileList(list);

  EXPECT_THAT(Elements(job.DownloadFiles()), ElementsAre(file));
  EXPECT_THAT(Elements(job.StorageRequirements()), ElementsAre(store));
  EXPECT_THAT(Elements(job.RegistryTests()), ElementsAre(test, nullptr));
  EXPECT_THAT(Elements(job.FirmwarePackages()), ElementsAre(package));
  EXPECT_EQ(job.GetMCFileList(), list);
}

TEST_F(UpgradeConfigTest, MakesAPackageEmpty) {
  const FirmwarePackage package;

  EXPECT_EQ(package.count, 0);
  for (const char* text : {package.base, package.destination_folder, package.source_folder,
                           package.command_line, package.additional_parameters}) {
    EXPECT_STREQ(text, "");
  }
}

TEST_F(UpgradeConfigTest, FreesEverythingThatItLists) {
  const std::size_t before = Blocks();
  {
    UpgradeConfig job;
    for (int i = 0; i < 100; ++i) {
      job.AddFileSave("s");
      job.AddFileDelete("d");
      job.AddStopProcess("p");
      job.AddDownloadFile(NewRecord<tagDownloadFile>());
      job.AddStorageReqEntry(NewRecord<tagStorageReq>());
      job.AddRegistryTest(NewRecord<tagRegistryTest>());
      job.AddFirmwarePkg(new FirmwarePackage);
    }
    job.AddMCFileList(NewRecord<tagDownloadFile>());
    EXPECT_EQ(job.FilesToSave().size(), 100U);
  }
  EXPECT_EQ(Blocks(), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(UpgradeConfigTest, FreesARecordOnceHoweverOftenItWasAdded) {
  const std::size_t before = Blocks();
  {
    UpgradeConfig job;
    auto* const file = NewRecord<tagDownloadFile>();
    auto* const other = NewRecord<tagDownloadFile>();
    auto* const package = new FirmwarePackage;
    for (int i = 0; i < 3; ++i) {
      job.AddDownloadFile(file);
      job.AddDownloadFile(other);
      job.AddDownloadFile(nullptr);
      job.AddFirmwarePkg(package);
    }
    job.AddMCFileList(file);
    EXPECT_EQ(job.DownloadFiles().size(), 9U) << "listed as often as added";
  }
  EXPECT_EQ(Blocks(), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(UpgradeConfigTest, ReplacesAMulticastListWithoutFreeingTheFirst) {
  const std::size_t before = Blocks();
  auto* const first = NewRecord<tagDownloadFile>();
  {
    UpgradeConfig job;
    job.AddMCFileList(first);
    job.AddMCFileList(NewRecord<tagDownloadFile>());
  }
  EXPECT_EQ(Blocks(), before + 1);
  LocalFree(first);
}

// ---- without memory ----

TEST_F(UpgradeConfigTest, LosesWhatItCannotListAndLeaksNothing) {
  const std::size_t before = Blocks();
  for (std::uint64_t nth = 1; nth <= 40; ++nth) {
    {
      UpgradeConfig job;
      const std::uint64_t fired = device().faults().fired();
      device().faults().Clear();
      device().faults().Add({"LocalAlloc", nth, 1, ERROR_OUTOFMEMORY});
      for (int i = 0; i < 9; ++i) {  // a list's array grows at the ninth
        job.AddFileSave("s");
        job.AddStopProcess("p");
        if (auto* const file = NewRecord<tagDownloadFile>(); file != nullptr) {
          job.AddDownloadFile(file);
        }
      }
      const std::size_t listed =
          job.FilesToSave().size() + job.ProcessesToStop().size() + job.DownloadFiles().size();
      EXPECT_EQ(listed, 27U - (device().faults().fired() - fired)) << "allocation " << nth;
    }
    EXPECT_EQ(Blocks(), before) << "allocation " << nth;
    EXPECT_EQ(device().memory().bad_frees(), 0U) << "allocation " << nth;
  }
}

TEST_F(UpgradeConfigTest, CopiesToAnEmptyListWhenThereIsNoMemory) {
  UpgradeConfig job;
  job.AddFileSave("s");
  device().faults().Add({"LocalAlloc", 1, 0, ERROR_OUTOFMEMORY});

  const UpgradeConfig copy(job);

  EXPECT_TRUE(copy.FilesToSave().empty());
  device().faults().Clear();
}

TEST_F(UpgradeConfigTest, KeepsARecordThatIsListedAlreadyWhenThereIsNoMemoryToListItAgain) {
  const std::size_t before = Blocks();
  {
    UpgradeConfig job;
    auto* const file = NewRecord<tagDownloadFile>();
    auto* const list = NewRecord<tagDownloadFile>();
    job.AddMCFileList(list);
    for (int i = 0; i < 8; ++i) job.AddDownloadFile(file);
    device().faults().Add({"LocalAlloc", 1, 0, ERROR_OUTOFMEMORY});

    job.AddDownloadFile(file);
    job.AddDownloadFile(list);

    EXPECT_EQ(job.DownloadFiles().size(), 8U);
    std::strcpy(file->source, "alive");
    std::strcpy(job.GetMCFileList()->source, "alive");
    device().faults().Clear();
  }
  EXPECT_EQ(Blocks(), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

}  // namespace
}  // namespace test
