// A program that has no host: it loads its job from a configuration file and starts the upgrade.
#include <gmock/gmock.h>

#include <string>
#include <string_view>
#include <vector>

#include "ce/kernel.h"
#include "ce/system.h"
#include "memory/memory.h"
#include "net/virtual/virtual_server.h"
#include "orvenix/upgrade_thread.h"
#include "process/processes.h"
#include "scenario/scenario_test.h"

namespace {

using test::GetFile;
using test::LogLinesWith;
using test::PutFile;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Optional;
using ::testing::SizeIs;

constexpr char kFile[] = "\\windows\\upgrade.xml";
constexpr char kJob[] = R"(<?xml version="1.0"?>
<Job>
  <BaseUrl>http://127.0.0.2</BaseUrl>
  <ShowGUI>true</ShowGUI>
  <OSFirmware>
    <Package HardwareVersion="MR4,7?" SourceDir="fw" Base="other.bin" DestDir="\"/>
    <Package HardwareVersion="MR4,TQ5*" FLASH="0" SourceDir="fw" Base="os" Count="2"
             DestDir="\Images"/>
  </OSFirmware>
  <InfFile>apps/job.inf</InfFile>
  <Downloads>
    <File SourceDir="misc/a.txt" DestDir="\Data\a.txt"/>
    <File SourceDir="misc/forgotten.txt"/>
  </Downloads>
</Job>
)";

/// A job that wants the radio to have firmware 7 and room for new data.
constexpr char kPreparedJob[] = R"(<Job>
  <BaseUrl>http://127.0.0.2</BaseUrl>
  <Registry>
    <Root>HKEY_LOCAL_MACHINE</Root>
    <Key>Software\Radio</Key>
    <ValueName>Firmware</ValueName>
    <Type>REG_DWORD</Type>
    <Operator>GTE</Operator>
    <Value>7</Value>
    <ErrorMsg>Radio is too old</ErrorMsg>
  </Registry>
  <StopProcesses><Process>scanner.exe</Process></StopProcesses>
  <DiskCleanup>
    <File Action="delete">\Data</File>
    <File Action="save">\Data\stock.db</File>
  </DiskCleanup>
  <Downloads><File SourceDir="misc/a.txt" DestDir="\Data\a.txt"/></Downloads>
</Job>
)";

class ConfigurationFileTest : public test::ScenarioTest {
 protected:
  ConfigurationFileTest() {
    server().Put("fw/os001.zip", "part one");
    server().Put("fw/os002.zip", "part two");
    server().Put("fw/other.bin", "for others");
    server().Put("apps/job.inf", "\"*******\" \"x.cab\" \"\\Temp\\x.cab\"\n");
    server().Put("apps/x.cab", "cabinet");
    server().Put("misc/a.txt", "text");
    PutFile("\\Data\\a.txt", "old text");
  }

  static void StoreRadio(DWORD firmware) {
    HKEY key = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, u"Software\\Radio", 0, nullptr, 0, KEY_ALL_ACCESS, nullptr,
                    &key, nullptr);
    RegSetValueExW(key, u"Firmware", 0, REG_DWORD, reinterpret_cast<const BYTE*>(&firmware),
                   sizeof firmware);
    RegCloseKey(key);
  }

  /// What a program does that is given a configuration file. @return whether an upgrade was
  /// started.
  static bool LoadAndStart() {
    auto* const job = new UpgradeConfig;
    if (job->LoadFromFile(u"upgrade.xml") == 0) {
      delete job;
      return false;
    }
    HANDLE const thread = StartUpgradeThread(job, 1);
    if (thread == nullptr) return false;
    CloseHandle(thread);
    return true;
  }
};

TEST_F(ConfigurationFileTest, UpgradesTheDevice) {
  const test::Holdings before = test::HoldingsOf(device());
  PutFile(kFile, kJob);

  ASSERT_TRUE(LoadAndStart());
  EXPECT_FALSE(test::Exists(kFile)) << "loaded once";
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));

  EXPECT_THAT(GetFile("\\Images\\os001.zip"), Optional(std::string("part one")));
  EXPECT_THAT(GetFile("\\Images\\os002.zip"), Optional(std::string("part two")));
  EXPECT_THAT(GetFile("\\Temp\\x.cab"), Optional(std::string("cabinet")));
  EXPECT_THAT(GetFile("\\Data\\a.txt"), Optional(std::string("text")));
  EXPECT_FALSE(test::Exists("\\other.bin"));
  EXPECT_THAT(server().RequestedPaths(),
              ElementsAre("apps\\job.inf:1,2", "fw\\os001.zip:2,5", "fw\\os002.zip:3,5",
                          "apps\\job.inf:4,5", "apps\\x.cab:5,5", "misc/a.txt:6,5"));
  EXPECT_EQ(server().Device().report->error, "");
  EXPECT_THAT(ShownLines(), Contains("Upgrade Complete"));
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(ConfigurationFileTest, StartsNothingASecondTime) {
  PutFile(kFile, kJob);
  ASSERT_TRUE(LoadAndStart());
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_FALSE(LoadAndStart());
  EXPECT_THAT(LogLinesWith("Orvenix thread - Started"), SizeIs(1));
}

TEST_F(ConfigurationFileTest, CountsThePassesThatASelectedPackageNames) {
  for (int pass = 1; pass <= 2; ++pass) {
    PutFile(kFile,
            "<Job><BaseUrl>http://127.0.0.2</BaseUrl><ShowGUI>false</ShowGUI><OSFirmware>"
            "<Package HardwareVersion='TQ' SourceDir='fw' Base='os001.zip' DestDir='\\'/>"
            "<Package HardwareVersion='TQ' SourceDir='fw' Base='os002.zip' DestDir='\\'"
            " AdditionalParms='Pass=2'/></OSFirmware></Job>");
    ASSERT_TRUE(LoadAndStart());
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
    EXPECT_TRUE(test::Exists("\\os001.zip"));
    EXPECT_EQ(test::Exists("\\os002.zip"), pass == 2);
    Restart();
  }
}

TEST_F(ConfigurationFileTest, TestsAndCleansTheDeviceBeforeItFetches) {
  StoreRadio(7);
  device().processes().Add(u"scanner.exe");
  PutFile("\\Data\\old.db", "old");
  PutFile("\\Data\\stock.db", "stock");
  PutFile(kFile, kPreparedJob);
  ASSERT_TRUE(LoadAndStart());
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(device().processes().List().size(), 1U) << "the test's own program";
  EXPECT_FALSE(test::Exists("\\Data\\old.db"));
  EXPECT_THAT(GetFile("\\Data\\stock.db"), Optional(std::string("stock")));
  EXPECT_THAT(GetFile("\\Data\\a.txt"), Optional(std::string("text")));
  EXPECT_EQ(server().Device().report->error, "");
}

TEST_F(ConfigurationFileTest, FetchesNothingWhenATestFails) {
  StoreRadio(6);
  device().processes().Add(u"scanner.exe");
  PutFile("\\Data\\old.db", "old");
  PutFile(kFile, kPreparedJob);
  ASSERT_TRUE(LoadAndStart());
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(device().processes().List().size(), 2U);
  EXPECT_TRUE(test::Exists("\\Data\\old.db"));
  EXPECT_THAT(GetFile("\\Data\\a.txt"), Optional(std::string("old text")));
  EXPECT_THAT(server().RequestedPaths(), IsEmpty());
  EXPECT_THAT(ShownLines(), Contains(HasSubstr("Radio is too old")));
}

TEST_F(ConfigurationFileTest, SendsItsLogWhereTheFileSays) {
  std::vector<std::string> received;
  const sim::VirtualPort syslog(world(), {test::kServerAddress, 514},
                                [&](sim::VirtualPort&, const sim::Endpoint&,
                                    std::string_view bytes) { received.emplace_back(bytes); });
  PutFile(kFile,
          "<Job><BaseUrl>http://127.0.0.2</BaseUrl><ShowGUI>false</ShowGUI>"
          "<Syslog Address='127.0.0.2' Port='514'/></Job>");
  ASSERT_TRUE(LoadAndStart());
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(received, Contains(HasSubstr("Orvenix thread - Started\r\n")));
  EXPECT_THAT(LogLinesWith("Orvenix thread - Started"), IsEmpty());
}

}  // namespace
