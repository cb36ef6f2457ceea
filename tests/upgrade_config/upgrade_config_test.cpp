#include "orvenix/upgrade_config.h"

#include <gmock/gmock.h>

#include <cstring>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class UpgradeConfigTest : public DeviceTest {
 protected:
  [[nodiscard]] std::size_t Blocks() { return device().memory().live_blocks(); }

  template <typename Record>
  static Record* NewRecord() {
    return static_cast<Record*>(LocalAlloc(LPTR, sizeof(Record)));
  }
};

template <typename T>
std::vector<T*> Elements(const orvenix::PointerList<T>& list) {
  std::vector<T*> elements;
  for (T* element : list) elements.push_back(element);
  EXPECT_EQ(elements.size(), list.size());
  EXPECT_EQ(elements.empty(), list.empty());
  return elements;
}

std::vector<std::string> Texts(const orvenix::PointerList<char>& list) {
  std::vector<std::string> texts;
  for (const char* text : list) texts.emplace_back(text);
  return texts;
}

// ---- a new record ----

TEST_F(UpgradeConfigTest, BeginsWithTheDefaults) {
  const UpgradeConfig job;

  EXPECT_EQ(job.GetXferPacketSize(), 4096);
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_EQ(job.GetMulticastPort(), 0);
  EXPECT_EQ(job.GetMulticastBlockSize(), 4096);
  EXPECT_EQ(job.GetProcessWait(), 1);
  EXPECT_EQ(job.GetShowGUI(), 1);
  EXPECT_EQ(job.GetSysLogPort(), 0);
  EXPECT_EQ(job.IsMultiPass(), 0);
  EXPECT_EQ(job.GetDownloadLoopCount(), 0);
  EXPECT_EQ(job.GetFirmwarePackageCount(), 0);
  EXPECT_EQ(job.GetMCFileList(), nullptr);
  EXPECT_STREQ(job.GetFlash(), "0");
  for (const char* text :
       {job.GetHTTPIPAddress(), job.GetBaseURL(), job.GetMCIp(), job.GetMCEncryptionKey(),
        job.GetMCProcessParms(), job.GetProcessName(), job.GetProcessParms(), job.GetVersion(),
        job.GetFlashFileStore(), job.GetFlashFileFolder(), job.GetSysLogIP(), job.GetUpgBeginMsg(),
        job.GetUpgEndMsg(), job.GetINFFileSrc(), job.GetINFFile()}) {
    EXPECT_STREQ(text, "");
  }
}

TEST_F(UpgradeConfigTest, BeginsWithEmptyListsAndTheDevicesIdentity) {
  const UpgradeConfig job;

  EXPECT_THAT(Elements(job.DownloadFiles()), IsEmpty());
  EXPECT_THAT(Elements(job.FirmwarePackages()), IsEmpty());
  EXPECT_THAT(Elements(job.StorageRequirements()), IsEmpty());
  EXPECT_THAT(Elements(job.RegistryTests()), IsEmpty());
  EXPECT_THAT(Texts(job.FilesToDelete()), IsEmpty());
  EXPECT_THAT(Texts(job.FilesToSave()), IsEmpty());
  EXPECT_THAT(Texts(job.ProcessesToStop()), IsEmpty());
  EXPECT_STREQ(job.GetMfgString(), "TQ52-A1");
  EXPECT_STREQ(job.GetSerialNumber(), "MR700123");
  EXPECT_STREQ(job.GetUniqueId(), "TQ52MR700123");
}

TEST_F(UpgradeConfigTest, LivesInLocalMemory) {
  const std::size_t before = Blocks();

  auto* const job = new UpgradeConfig;

  EXPECT_EQ(Blocks(), before + 1);
  delete job;
  EXPECT_EQ(Blocks(), before);
}

TEST_F(UpgradeConfigTest, IsNullWhenThereIsNoMemoryForIt) {
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});

  EXPECT_EQ(new UpgradeConfig, nullptr);
}

// ---- accessors ----

struct TextField {
  const char* name;
  const char* (UpgradeConfig::*get)() const noexcept;
  void (UpgradeConfig::*set)(const char*) noexcept;
  std::size_t size;
};

using U = UpgradeConfig;
const TextField kTextFields[] = {
    {"HTTPIPAddress", &U::GetHTTPIPAddress, &U::SetHTTPIPAddress, 24},
    {"BaseURL", &U::GetBaseURL, &U::SetBaseURL, 256},
    {"MCIp", &U::GetMCIp, &U::SetMCIp, 24},
    {"MCEncryptionKey", &U::GetMCEncryptionKey, &U::SetMCEncryptionKey, 256},
    {"MCProcessParms", &U::GetMCProcessParms, &U::SetMCProcessParms, 260},
    {"ProcessName", &U::GetProcessName, &U::SetProcessName, 260},
    {"ProcessParms", &U::GetProcessParms, &U::SetProcessParms, 260},
    {"FlashFileStore", &U::GetFlashFileStore, &U::SetFlashFileStore, 64},
    {"SysLogIP", &U::GetSysLogIP, &U::SetSysLogIP, 32},
    {"UpgBeginMsg", &U::GetUpgBeginMsg, &U::SetUpgBeginMsg, 64},
    {"UpgEndMsg", &U::GetUpgEndMsg, &U::SetUpgEndMsg, 64},
};

TEST_F(UpgradeConfigTest, KeepsEveryTextInAFieldOfItsOwn) {
  UpgradeConfig job;
  for (const TextField& field : kTextFields) (job.*field.set)(field.name);

  for (const TextField& field : kTextFields) EXPECT_STREQ((job.*field.get)(), field.name);
}

TEST_F(UpgradeConfigTest, CutsTextsToTheirFieldAndTouchesNoOther) {
  for (const TextField& field : kTextFields) {
    UpgradeConfig job;
    const UpgradeConfig untouched;
    const std::string longest(field.size - 1, 'x');

    (job.*field.set)((longest + "too long").c_str());

    EXPECT_EQ((job.*field.get)(), longest) << field.name;
    for (const TextField& other : kTextFields) {
      if (other.get == field.get) continue;
      EXPECT_STREQ((job.*other.get)(), (untouched.*other.get)()) << field.name << other.name;
    }
    EXPECT_EQ(job.GetShowGUI(), 1) << field.name;
    EXPECT_EQ(job.GetSysLogPort(), 0) << field.name;
  }
}

TEST_F(UpgradeConfigTest, TakesNullTextsAsEmpty) {
  for (const TextField& field : kTextFields) {
    UpgradeConfig job;
    (job.*field.set)("before");
    (job.*field.set)(nullptr);
    EXPECT_STREQ((job.*field.get)(), "") << field.name;
  }
}

TEST_F(UpgradeConfigTest, TakesATextThatPointsIntoItself) {
  UpgradeConfig job;
  job.SetBaseURL("http://server/");

  job.SetBaseURL(job.GetBaseURL() + 5);

  EXPECT_STREQ(job.GetBaseURL(), "//server/");
}

TEST_F(UpgradeConfigTest, KeepsNumbersAsTheyAreGiven) {
  struct NumberField {
    int (UpgradeConfig::*get)() const noexcept;
    void (UpgradeConfig::*set)(int) noexcept;
  };
  const NumberField fields[] = {{&U::GetHTTPPort, &U::SetHTTPPort},
                                {&U::GetMulticastPort, &U::SetMulticastPort},
                                {&U::GetMulticastBlockSize, &U::SetMulticastBlockSize},
                                {&U::GetProcessWait, &U::SetProcessWait},
                                {&U::GetShowGUI, &U::SetShowGUI}};
  for (const NumberField& field : fields) {
    UpgradeConfig job;
    for (const int value : {0, 1, -1, 70000, 2147483647, -2147483647 - 1}) {
      (job.*field.set)(value);
      EXPECT_EQ((job.*field.get)(), value);
    }
  }
}

TEST_F(UpgradeConfigTest, KeepsSixteenBitsOfTheSyslogPort) {
  struct Case {
    int set;
    int kept;
  };
  UpgradeConfig job;
  for (const Case c :
       {Case{70000, 4464}, Case{514, 514}, Case{65535, 65535}, Case{65536, 0}, Case{-1, 65535}}) {
    job.SetSysLogPort(c.set);
    EXPECT_EQ(job.GetSysLogPort(), c.kept);
  }
}

TEST_F(UpgradeConfigTest, AppendsWriterParametersBehindABlank) {
  UpgradeConfig job;
  job.AppendFlashWriterParms(nullptr);
  EXPECT_STREQ(job.GetProcessParms(), "");

  job.AppendFlashWriterParms("x");
  EXPECT_STREQ(job.GetProcessParms(), " x") << "a blank also before the first";
  job.AppendFlashWriterParms("");
  EXPECT_STREQ(job.GetProcessParms(), " x ");

  job.SetProcessParms("a");
  job.AppendFlashWriterParms("x");
  job.AppendFlashWriterParms(nullptr);
  EXPECT_STREQ(job.GetProcessParms(), "a x");
}

TEST_F(UpgradeConfigTest, CutsAppendedWriterParametersAtTheEndOfTheField) {
  UpgradeConfig job;
  const std::string part(200, 'p');
  job.SetProcessParms(part.c_str());

  job.AppendFlashWriterParms(part.c_str());
  job.AppendFlashWriterParms(job.GetProcessParms());

  EXPECT_EQ(job.GetProcessParms(), (part + ' ' + part).substr(0, 259));
  EXPECT_STREQ(job.GetFlashFileStore(), "");
}

// ---- lists ----

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

// ---- copies ----

TEST_F(UpgradeConfigTest, SharesItsElementsWithACopy) {
  const std::size_t before = Blocks();
  auto* const original = new UpgradeConfig;
  original->SetBaseURL("http://server/");
  original->SetSysLogPort(514);
  original->AddDownloadFile(NewRecord<tagDownloadFile>());
  original->AddFileSave("\\kept");
  original->AddMCFileList(NewRecord<tagDownloadFile>());

  auto* const copy = new UpgradeConfig(*original);

  EXPECT_STREQ(copy->GetBaseURL(), "http://server/");
  EXPECT_EQ(copy->GetSysLogPort(), 514);
  EXPECT_STREQ(copy->GetUniqueId(), original->GetUniqueId());
  EXPECT_EQ(Elements(copy->DownloadFiles()), Elements(original->DownloadFiles()));
  EXPECT_EQ(Elements(copy->FilesToSave()), Elements(original->FilesToSave()));
  EXPECT_EQ(copy->GetMCFileList(), original->GetMCFileList());
  // A list grows alone.
  copy->AddFileSave("\\new");
  EXPECT_EQ(original->FilesToSave().size(), 1U);
  // Only one of the two is destroyed; of the other, the arrays and the record alone remain.
  delete copy;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_EQ(Blocks(), before + 3) << "the original and its two arrays";
}

TEST_F(UpgradeConfigTest, SharesItsElementsAfterAnAssignmentAndKeepsTheOldOnesAlive) {
  auto* const kept = NewRecord<tagDownloadFile>();
  auto* const target = new UpgradeConfig;
  target->AddDownloadFile(kept);
  auto* const source = new UpgradeConfig;
  source->AddDownloadFile(NewRecord<tagDownloadFile>());
  source->SetHTTPPort(8080);

  *target = *source;

  EXPECT_EQ(Elements(target->DownloadFiles()), Elements(source->DownloadFiles()));
  EXPECT_EQ(target->GetHTTPPort(), 8080);
  std::strcpy(kept->source, "still there");
  LocalFree(kept);
  delete target;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(UpgradeConfigTest, IsUnchangedByAnAssignmentToItself) {
  UpgradeConfig job;
  job.AddFileSave("\\kept");
  job.SetBaseURL("http://server/");
  UpgradeConfig& same = job;

  job = same;

  EXPECT_THAT(Texts(job.FilesToSave()), ElementsAre("\\kept"));
  EXPECT_STREQ(job.GetBaseURL(), "http://server/");
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
