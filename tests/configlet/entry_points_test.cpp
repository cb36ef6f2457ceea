#include <gmock/gmock.h>

#include <array>
#include <cstring>
#include <string>

#include "configlet/configlet_test.h"
#include "report/messages/host_callbacks.h"
#include "upgrade/run_state/run_state.h"

namespace configlet {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

using EntryPointsTest = ConfigletTest;

TEST_F(EntryPointsTest, TellTheirVersions) {
  std::uint32_t major = 0xBDBDBDBD;
  std::uint32_t minor = 0xBDBDBDBD;

  EXPECT_EQ(IcfgGetInterfaceVersion(), 2U);
  EXPECT_EQ(IcfgGetSchemaVersion(4711, &major, &minor), ICFG_OK);

  EXPECT_EQ(major, 1U);
  EXPECT_EQ(minor, 0U);
}

TEST_F(EntryPointsTest, KnowNoInstances) {
  char name[4] = "abc";

  EXPECT_EQ(IcfgGetFirstInstance(0, name), ICFG_OK);
  EXPECT_EQ(IcfgGetNextInstance(), 1U);
  EXPECT_EQ(IcfgGetNextInstance(), 1U);

  EXPECT_EQ(std::string(name, 3), std::string("\0bc", 3)) << "an empty name, and nothing more";
}

TEST_F(EntryPointsTest, PassOverNullPointers) {
  EXPECT_EQ(IcfgGetSchemaVersion(0, nullptr, nullptr), ICFG_OK);
  EXPECT_EQ(IcfgGetFirstInstance(0, nullptr), ICFG_OK);
  EXPECT_EQ(IcfgGetField("Protocol Version", 0, 0, nullptr, nullptr), ICFG_OK);
  EXPECT_EQ(Begin(nullptr), ICFG_UNKNOWN_NAME);
  EXPECT_EQ(End(nullptr), ICFG_OK);
  Begin("Orvenix");
  EXPECT_EQ(Set(nullptr, "10.0.0.1"), ICFG_OK) << "an empty name is the first field's";
  EXPECT_STREQ(job().GetSysLogIP(), "10.0.0.1");
  EXPECT_EQ(Set("Address", nullptr), ICFG_OK);
  EXPECT_STREQ(job().GetSysLogIP(), "");
  EXPECT_EQ(IcfgSetCallbacks(0, nullptr), ICFG_OK);
}

TEST_F(EntryPointsTest, RememberTheHostsCallbacks) {
  IcfgCallbacks table = {};

  EXPECT_EQ(IcfgSetCallbacks(4711, &table), ICFG_OK);

  EXPECT_EQ(report::GetHostCallbacks().context, 4711U);
  EXPECT_EQ(report::GetHostCallbacks().table, &table);
}

TEST_F(EntryPointsTest, FreeNothingAtTheEnd) {
  Begin("Orvenix");

  EXPECT_EQ(IcfgUninitialize(), ICFG_OK);

  EXPECT_TRUE(HasJob());
}

// ---- IcfgInitialize ----

TEST_F(EntryPointsTest, ForgetTheCurrentGroupWhenInitialized) {
  Begin("Syslog");
  const std::size_t blocks = device().memory().live_blocks();

  EXPECT_EQ(IcfgInitialize(), ICFG_OK);
  EXPECT_EQ(IcfgInitialize(), ICFG_OK);

  EXPECT_EQ(Group(), "");
  EXPECT_EQ(device().memory().live_blocks(), blocks);
}

TEST_F(EntryPointsTest, WorkWithoutBeingInitialized) {
  EXPECT_EQ(Begin("Orvenix"), ICFG_OK);
  EXPECT_EQ(Set("BaseURL", "http://server/"), ICFG_OK);
  EXPECT_STREQ(job().GetBaseURL(), "http://server/");
}

// ---- IcfgGetField ----

TEST_F(EntryPointsTest, AnswerEveryLeadingPartOfProtocolVersion) {
  for (const char* name : {"Protocol Version", "protocol version", "PROT", "Prot", "p", ""}) {
    std::array<char, 8> text;
    text.fill('\xBD');
    std::uint32_t length = 0;

    EXPECT_EQ(IcfgGetField(name, 1, 2, text.data(), &length), ICFG_OK) << name;

    EXPECT_STREQ(text.data(), "3.44");
    EXPECT_EQ(length, 4U);
    EXPECT_EQ(text[5], '\xBD') << "nothing behind the terminator";
  }
}

TEST_F(EntryPointsTest, AnswerNoOtherName) {
  for (const char* name : {"Protocol Version ", "Protocol Versions", "Version", "Protocol-", "x"}) {
    char text[8] = "before";
    std::uint32_t length = 99;

    EXPECT_EQ(IcfgGetField(name, 0, 0, text, &length), ICFG_UNKNOWN_NAME) << name;

    EXPECT_STREQ(text, "before");
    EXPECT_EQ(length, 99U);
  }
  EXPECT_EQ(Log(), "");
}

TEST_F(EntryPointsTest, LogTheReadingOfTheVersion) {
  IcfgGetField("Prot", 0, 0, nullptr, nullptr);

  EXPECT_EQ(Log(), "Getting MCFTP Version\r\nMCFTP Version = 3.44\r\n");
}

// ---- names ----

TEST_F(EntryPointsTest, AcceptTheGroupsOfTheSchemaInAnyLetterCase) {
  for (const char* group :
       {"Orvenix", "Syslog", "Upgrade", "MultiCast", "MulticastClient", "HTTPServer", "Download",
        "StorageRequirements", "Store", "DiskCleanup", "File", "FileList", "AlternateRTWReason",
        "StartProcess", "StopProcess", "Process", "Tests", "Test", "Registry"}) {
    std::string other(group);
    for (char& c : other)
      c = static_cast<char>(std::islower(c) != 0 ? std::toupper(c) : std::tolower(c));
    EXPECT_EQ(Begin(group), ICFG_OK) << group;
    EXPECT_EQ(Group(), group);
    upgrade::EndUpgrade();
    EXPECT_EQ(Begin(other.c_str()), ICFG_OK) << other;
    EXPECT_EQ(Group(), other) << "as the host spells it";
    upgrade::EndUpgrade();
  }
}

TEST_F(EntryPointsTest, RefuseEveryOtherGroupAndStillRememberIt) {
  const std::string long_name = "Orvenix" + std::string(200, ' ');
  for (const char* group :
       {"", "Up", "Upgrade ", "Upgrades", "Groups", "Multicast Client", long_name.c_str()}) {
    EXPECT_EQ(Begin(group), ICFG_UNKNOWN_NAME) << group;
    EXPECT_EQ(Group(), std::string(group).substr(0, 127));
    EXPECT_EQ(End(group), ICFG_OK) << "an end of anything else does nothing";
  }
  EXPECT_FALSE(HasJob());
}

TEST_F(EntryPointsTest, RefuseANameWhoseFirstHundredCharactersAreAGroups) {
  std::string name(130, 'x');
  name.replace(0, 7, "Orvenix");

  EXPECT_EQ(Begin(name.c_str()), ICFG_UNKNOWN_NAME);

  EXPECT_EQ(Group(), name.substr(0, 127));
  EXPECT_FALSE(HasJob());
}

TEST_F(EntryPointsTest, DoNotBringTheParentBackAtTheEndOfAGroup) {
  Begin("Orvenix");
  Begin("DiskCleanup");
  Begin("File");
  End("File");

  EXPECT_EQ(Group(), "File");
}

TEST_F(EntryPointsTest, LogGroupsAndFieldsBeforeTheyAreAccepted) {
  Begin("Nothing");
  Begin("Syslog");
  Set("Adress", "x");
  Set("Pro", "50%s%n");
  End("Syslog");

  EXPECT_EQ(Log(),
            "IcfgBeginGroup - Nothing\r\n"
            "IcfgBeginGroup - Syslog\r\n"
            "IcfgSetField - Adress, x\r\n"
            "IcfgSetField - Pro, 50%s%n\r\n");
}

TEST_F(EntryPointsTest, SurviveTextsOfAnyLength) {
  const std::string longest(100000, 'x');
  Begin("Orvenix");
  Begin("Download");
  Begin("File");

  EXPECT_EQ(Begin(longest.c_str()), ICFG_UNKNOWN_NAME);
  EXPECT_EQ(Set(longest.c_str(), longest.c_str()), ICFG_UNKNOWN_NAME);
  EXPECT_EQ(Set("MCTMask", longest.c_str()), ICFG_OK);
  EXPECT_EQ(Set("BaseURL", longest.c_str()), ICFG_OK);
  EXPECT_EQ(End(longest.c_str()), ICFG_OK);
  EXPECT_EQ(End("File"), ICFG_OK);

  EXPECT_EQ(std::strlen(job().GetBaseURL()), 255U);
  EXPECT_EQ(std::strlen(job().DownloadFiles()[0]->masks), 2007U);
  EXPECT_STREQ(job().DownloadFiles()[0]->work_area, "");
}

// ---- the top group ----

TEST_F(EntryPointsTest, MakeAJobAtTheTop) {
  EXPECT_EQ(Begin("Orvenix"), ICFG_OK);

  ASSERT_TRUE(HasJob());
  EXPECT_EQ(job().GetHTTPPort(), 80);
  EXPECT_STREQ(job().GetUniqueId(), "TQ52MR700123");
  EXPECT_EQ(Log(), "IcfgBeginGroup - Orvenix\r\nAllocating gpUpgCfg\r\n");
}

TEST_F(EntryPointsTest, MakeNoJobInAnotherMode) {
  EXPECT_EQ(Begin("Orvenix", 1), ICFG_OK);

  EXPECT_FALSE(HasJob());
  EXPECT_EQ(Group(), "Orvenix");
  EXPECT_EQ(Log(), "IcfgBeginGroup - Orvenix\r\n");
}

TEST_F(EntryPointsTest, KeepTheFormerJobAliveAndTheOpenGroupsOpenWhenTheTopBeginsAgain) {
  Begin("Orvenix");
  UpgradeConfig& first = job();
  Begin("StartProcess");

  Begin("Orvenix");

  EXPECT_NE(&job(), &first);
  first.SetBaseURL("still there");
  EXPECT_TRUE(TheWalk().in_start_process);
  Set("Process", "new.exe");
  EXPECT_STREQ(job().GetProcessName(), "new.exe");
  delete &first;
}

TEST_F(EntryPointsTest, StoreNothingBeforeThereIsAJob) {
  for (const char* group : {"Download", "File", "FileList", "Store", "Registry", "DiskCleanup",
                            "StartProcess", "StopProcess"}) {
    EXPECT_EQ(Begin(group), ICFG_OK);
    for (const char* field : {"Port", "Process", "Source", "Name", "Action", "RequiredSpace",
                              "Value", "Wait", "Parameters", "ErrorMsg"}) {
      EXPECT_EQ(Set(field, "1"), ICFG_OK) << group << '/' << field;
    }
    EXPECT_EQ(End(group), ICFG_OK);
  }
  EXPECT_FALSE(HasJob());
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(EntryPointsTest, LeaveNothingCurrentWhenThereIsNoMemoryForAJob) {
  device().faults().Add({"LocalAlloc", 1, 1, 0});

  EXPECT_EQ(Begin("Orvenix"), ICFG_OK);

  EXPECT_FALSE(HasJob());
  EXPECT_EQ(Set("BaseURL", "x"), ICFG_OK);
}

// ---- one upgrade at a time ----

TEST_F(EntryPointsTest, RefuseASecondUpgradeWhileOneIsInProgress) {
  Begin("Orvenix");
  EXPECT_EQ(Begin("Upgrade"), ICFG_OK);
  EXPECT_TRUE(upgrade::UpgradeInProgress());
  ForgetLog();

  EXPECT_EQ(Begin("upgrade"), ICFG_UPGRADE_RUNNING);

  EXPECT_EQ(Log(), "IcfgBeginGroup - upgrade\r\nUpgrade already in progress\r\n");
  EXPECT_EQ(Group(), "upgrade");
  EXPECT_TRUE(upgrade::UpgradeInProgress());
}

}  // namespace
}  // namespace configlet
