// A new job, its identity and its plain fields.
#include "upgrade_config/upgrade_config_test.h"

namespace test {
namespace {

using ::testing::IsEmpty;

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
  device().faults().Add({"LocalAlloc", 1, 0, ERROR_OUTOFMEMORY});

  EXPECT_EQ(new UpgradeConfig, nullptr);
  EXPECT_EQ(new (std::nothrow) UpgradeConfig, nullptr);
  EXPECT_EQ(new FirmwarePackage, nullptr);
  EXPECT_EQ(new (std::nothrow) FirmwarePackage, nullptr);
  device().faults().Clear();
}

TEST_F(UpgradeConfigTest, SaysWhichListHasLostSomethingForWantOfMemory) {
  for (std::uint64_t nth = 1; nth <= 2; ++nth) {  // the copy of the text, the list's room
    UpgradeConfig job;
    device().faults().Add({"LocalAlloc", nth, 1, ERROR_OUTOFMEMORY});
    job.AddFileSave("\\a.txt");
    device().faults().Clear();
    EXPECT_TRUE(job.FilesToSave().incomplete()) << nth;
    EXPECT_TRUE(job.FilesToSave().empty()) << nth;
    EXPECT_FALSE(job.FilesToDelete().incomplete()) << nth;
    job.AddFileSave("\\b.txt");
    EXPECT_TRUE(job.FilesToSave().incomplete()) << "what is lost stays lost";
    UpgradeConfig other;
    other = job;
    EXPECT_TRUE(other.FilesToSave().incomplete()) << "in a copy too";
    job = UpgradeConfig();  // one of the two frees the text
    EXPECT_FALSE(job.FilesToSave().incomplete());
  }
}

TEST_F(UpgradeConfigTest, SaysSoWhenACopyHasLostItsList) {
  UpgradeConfig job;
  job.AddFileSave("\\a.txt");
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});
  const UpgradeConfig copy(job);
  device().faults().Clear();
  EXPECT_TRUE(copy.FilesToSave().incomplete());
  EXPECT_FALSE(job.FilesToSave().incomplete());
}

TEST_F(UpgradeConfigTest, LivesInLocalMemoryWhicheverNewMadeIt) {
  const std::size_t before = Blocks();

  auto* const job = new (std::nothrow) UpgradeConfig;
  auto* const package = new (std::nothrow) FirmwarePackage;

  EXPECT_EQ(Blocks(), before + 2);
  delete package;
  delete job;
  EXPECT_EQ(Blocks(), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

// ---- accessors ----

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

}  // namespace
}  // namespace test
