#include "configlet/fields.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "configlet/configlet_test.h"

namespace configlet {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

std::string NameOf(const char* given) {
  const FieldRow* const row = FindField(given);
  return row != nullptr ? std::string(row->name) : "none";
}

// ---- which field a name stands for ----

struct NameCase {
  const char* given;
  const char* field;
};

// Every leading part of every field's name, where the schema's order decides.
constexpr NameCase kNames[] = {
    {"", "Address"},
    {"A", "Address"},
    {"a", "Address"},
    {"Ad", "Address"},
    {"Addres", "Address"},
    {"ADDRESS", "Address"},
    {"Addresses", "none"},
    {"Ac", "Action"},
    {"Action", "Action"},
    {"P", "Port"},
    {"p", "Port"},
    {"Po", "Port"},
    {"Port", "Port"},
    {"Ports", "none"},
    {"Pr", "Process"},
    {"Pro", "Process"},
    {"process", "Process"},
    {"Processes", "none"},
    {"Pa", "Parameters"},
    {"Param", "Parameters"},
    {"I", "IPAddress"},
    {"IP", "IPAddress"},
    {"ipaddress", "IPAddress"},
    {"H", "HTTPPort"},
    {"HTTP", "HTTPPort"},
    {"HTTPPort", "HTTPPort"},
    {"B", "BaseURL"},
    {"Ba", "BaseURL"},
    {"BaseURL", "BaseURL"},
    {"Be", "BeginText"},
    {"Begin", "BeginText"},
    {"M", "MulticastIP"},
    {"Mu", "MulticastIP"},
    {"Multicast", "MulticastIP"},
    {"MC", "MCTMask"},
    {"mct", "MCTMask"},
    {"MCTMask", "MCTMask"},
    {"E", "EncryptionKey"},
    {"En", "EncryptionKey"},
    {"Enc", "EncryptionKey"},
    {"End", "EndText"},
    {"EndText", "EndText"},
    {"Er", "ErrorMsg"},
    {"Error", "ErrorMsg"},
    {"U", "UDPPort"},
    {"UDP", "UDPPort"},
    {"UDPP", "UDPPort"},
    {"UDPB", "UDPBlockSize"},
    {"UDPBlockSize", "UDPBlockSize"},
    {"W", "Wait"},
    {"Wait", "Wait"},
    {"S", "ShowGUI"},
    {"Sh", "ShowGUI"},
    {"showgui", "ShowGUI"},
    {"So", "Source"},
    {"Source", "Source"},
    {"N", "Name"},
    {"Name", "Name"},
    {"Names", "none"},
    {"D", "Dest"},
    {"Dest", "Dest"},
    {"Destination", "none"},
    {"C", "CRC"},
    {"crc", "CRC"},
    {"CRC32", "none"},
    {"R", "RequiredSpace"},
    {"Re", "RequiredSpace"},
    {"Ro", "Root"},
    {"Root", "Root"},
    {"K", "Key"},
    {"Key", "Key"},
    {"T", "Type"},
    {"Type", "Type"},
    {"O", "Operator"},
    {"Operator", "Operator"},
    {"Value", "Value"},
    {"VALUE", "Value"},
    {"ValueName", "ValueName"},
    {"valuename", "ValueName"},
    {"V", "none"},
    {"Va", "none"},
    {"Val", "none"},
    {"Valu", "none"},
    {"ValueN", "none"},
    {"ValueNam", "none"},
    {"ValueNames", "none"},
    {"X", "none"},
    {" ", "none"},
    {" Port", "none"},
    {"Port ", "none"},
    {"\xC4"
     "ddress",
     "none"},
};

TEST(FindFieldTest, TakesTheFirstFieldThatBeginsWithTheGivenLetters) {
  for (const NameCase& c : kNames) EXPECT_EQ(NameOf(c.given), c.field) << '"' << c.given << '"';
}

TEST(FindFieldTest, FindsEveryLeadingPartOfEveryName) {
  static constexpr const char* kInOrder[] = {
      "Address",       "Port",     "IPAddress",    "HTTPPort",      "BaseURL",    "MulticastIP",
      "EncryptionKey", "UDPPort",  "UDPBlockSize", "Process",       "Parameters", "Wait",
      "ShowGUI",       "Action",   "Name",         "BeginText",     "EndText",    "Source",
      "Dest",          "CRC",      "MCTMask",      "RequiredSpace", "Root",       "Key",
      "Type",          "Operator", "ErrorMsg"};
  for (const std::string name : kInOrder) {
    for (std::size_t length = 1; length <= name.size(); ++length) {
      const std::string part = name.substr(0, length);
      const std::string found = NameOf(part.c_str());
      EXPECT_EQ(found.substr(0, length), part) << "some field that begins so";
    }
    EXPECT_EQ(NameOf(name.c_str()), name);
    EXPECT_EQ(NameOf((name + "x").c_str()), "none");
  }
}

// ---- where a value goes ----

class FieldsTest : public ConfigletTest {
 protected:
  FieldsTest() { Begin("Orvenix"); }
};

struct TextCase {
  const char* field;
  const char* (UpgradeConfig::*get)() const noexcept;
};

TEST_F(FieldsTest, KeepTheJobsTextsWhateverGroupIsOpen) {
  using U = UpgradeConfig;
  static constexpr TextCase kCases[] = {{"Address", &U::GetSysLogIP},
                                        {"IPAddress", &U::GetHTTPIPAddress},
                                        {"BaseURL", &U::GetBaseURL},
                                        {"MulticastIP", &U::GetMCIp},
                                        {"EncryptionKey", &U::GetMCEncryptionKey},
                                        {"BeginText", &U::GetUpgBeginMsg},
                                        {"EndText", &U::GetUpgEndMsg}};
  for (const char* group : {"Orvenix", "Store", "Syslog"}) {
    Begin(group, 1);
    for (const TextCase& c : kCases) {
      const std::string value = std::string(group) + c.field;
      EXPECT_EQ(Set(c.field, value.c_str()), ICFG_OK);
      EXPECT_EQ((job().*c.get)(), value.substr(0, 23)) << c.field;
    }
  }
}

struct NumberCase {
  const char* text;
  std::int32_t number;
};

TEST_F(FieldsTest, ReadNumbersAsTheDeviceDoes) {
  static constexpr NumberCase kCases[] = {
      {"8080", 8080},    {" \t8080", 8080},
      {"8080x", 8080},   {"-1", -1},
      {"+7", 7},         {"x", 0},
      {"", 0},           {"0x10", 0},
      {"4294967297", 1}, {"2147483648", -2147483647 - 1},
      {"007", 7},        {"1e3", 1},
  };
  for (const NumberCase& c : kCases) {
    Set("HTTPPort", c.text);
    EXPECT_EQ(job().GetHTTPPort(), c.number) << c.text;
    Set("UDPPort", c.text);
    EXPECT_EQ(job().GetMulticastPort(), c.number) << c.text;
    Set("UDPBlockSize", c.text);
    EXPECT_EQ(job().GetMulticastBlockSize(), c.number) << c.text;
    Set("Port", c.text);
    EXPECT_EQ(job().GetSysLogPort(), c.number & 0xFFFF) << c.text;
  }
}

TEST_F(FieldsTest, TakeOnlyTheExactTextFalseAsFalse) {
  Begin("StartProcess");
  for (const char* value : {"False", "FALSE", "false ", "0", "", "no", "true"}) {
    Set("Wait", "false");
    Set("ShowGUI", "false");
    EXPECT_EQ(job().GetProcessWait(), 0);
    EXPECT_EQ(job().GetShowGUI(), 0);
    Set("Wait", value);
    Set("ShowGUI", value);
    EXPECT_EQ(job().GetProcessWait(), 1) << value;
    EXPECT_EQ(job().GetShowGUI(), 1) << value;
  }
}

TEST_F(FieldsTest, SetWaitInsideStartProcessOnly) {
  EXPECT_EQ(Set("Wait", "false"), ICFG_OK);
  EXPECT_EQ(job().GetProcessWait(), 1);

  Begin("StartProcess");
  Begin("Syslog");
  Set("Wait", "false");
  EXPECT_EQ(job().GetProcessWait(), 0) << "the group is still open";

  End("StartProcess");
  Set("Wait", "true");
  EXPECT_EQ(job().GetProcessWait(), 0) << "accepted and ignored";
}

std::vector<std::string> Texts(const orvenix::PointerList<char>& list) {
  std::vector<std::string> texts;
  for (const char* text : list) texts.emplace_back(text);
  return texts;
}

TEST_F(FieldsTest, SendProcessToTheProgramToStartOrToTheOnesToStop) {
  EXPECT_EQ(Set("Process", "nowhere.exe"), ICFG_OK);
  Begin("sToPpRoCeSs");
  Set("Process", "a.exe");
  Set("Process", "b.exe");
  Begin("StartProcess");
  Begin("StopProcess");
  Set("Process", "start.exe");
  End("StartProcess");
  Set("Process", "c.exe");

  EXPECT_STREQ(job().GetProcessName(), "start.exe") << "the open StartProcess comes first";
  EXPECT_THAT(Texts(job().ProcessesToStop()), ElementsAre("a.exe", "b.exe", "c.exe"));
}

TEST_F(FieldsTest, SendParametersToTheClientOnlyUnderTheExactGroupName) {
  Begin("multicastclient");
  EXPECT_EQ(Set("Parameters", "dropped"), ICFG_OK);
  EXPECT_STREQ(job().GetMCProcessParms(), "");

  Begin("StartProcess");
  Begin("MulticastCLIENT");
  Set("Parameters", "start");
  EXPECT_STREQ(job().GetMCProcessParms(), "");
  EXPECT_STREQ(job().GetProcessParms(), "start");

  Begin("MulticastClient");
  Set("Parameters", "client");
  EXPECT_STREQ(job().GetMCProcessParms(), "client") << "the group comes before StartProcess";
  EXPECT_STREQ(job().GetProcessParms(), "start");
}

// ---- files to fetch ----

TEST_F(FieldsTest, FillAFileToFetch) {
  Begin("Download");
  Begin("File");
  Set("Source", "src");
  Set("Dest", "\\dest");
  Set("CRC", "4294967295");
  Set("MCTMask", "MR41* MV41*");
  End("File");

  ASSERT_EQ(job().DownloadFiles().size(), 1U);
  const tagDownloadFile& file = *job().DownloadFiles()[0];
  EXPECT_STREQ(file.source, "src");
  EXPECT_STREQ(file.destination, "\\dest");
  EXPECT_STREQ(file.crc, "4294967295");
  EXPECT_STREQ(file.masks, "MR41* MV41*");
  EXPECT_STREQ(file.size, "");
}

TEST_F(FieldsTest, IgnoreFilesOutsideDownloadAndFileList) {
  EXPECT_EQ(Set("Source", "x"), ICFG_OK);
  Begin("File");
  EXPECT_EQ(Set("Source", "x"), ICFG_OK);
  End("File");
  EXPECT_TRUE(job().DownloadFiles().empty());

  Begin("Download");
  Begin("File");
  Set("Source", "inside");
  End("Download");
  Set("Source", "outside");
  Begin("Download");
  End("File");
  ASSERT_EQ(job().DownloadFiles().size(), 1U);
  EXPECT_STREQ(job().DownloadFiles()[0]->source, "inside");
}

TEST_F(FieldsTest, StillReachAFileAfterItsEnd) {
  Begin("Download");
  Begin("File");
  Set("Source", "first");
  End("File");

  Set("Source", "late");

  EXPECT_STREQ(job().DownloadFiles()[0]->source, "late");
}

// ---- cleanup ----

struct CleanupCase {
  const char* action;
  const char* name;
  bool saved;
  bool deleted;
  const char* why;
};

TEST_F(FieldsTest, SortCleanupFilesByTheirAction) {
  static constexpr CleanupCase kCases[] = {
      {"Save", "\\f", true, false, "save"},
      {"sAVE", "\\f", true, false, "in any letter case"},
      {"delete", "\\f", false, true, "delete"},
      {"DELETE", "\\f", false, true, "in any letter case"},
      {"Saved", "\\f", false, false, "whole words only"},
      {"D", "\\f", false, false, "whole words only"},
      {"", "\\f", false, false, "no action"},
      {"Save", "", false, false, "no name"},
      {"Delete", "", false, false, "no name"},
  };
  for (const CleanupCase& c : kCases) {
    Begin("Orvenix");
    Begin("DiskCleanup");
    Begin("File");
    Set("Action", c.action);
    Set("Name", c.name);
    End("File");
    EXPECT_EQ(job().FilesToSave().size(), c.saved ? 1U : 0U) << c.action << ": " << c.why;
    EXPECT_EQ(job().FilesToDelete().size(), c.deleted ? 1U : 0U) << c.action << ": " << c.why;
  }
}

TEST_F(FieldsTest, KeepAnEarlierActionWhenTheNextMeansNothing) {
  Begin("DiskCleanup");
  Begin("File");
  Set("Action", "Delete");
  Set("Action", "Keep");
  Set("Name", "\\f");
  End("File");

  EXPECT_THAT(Texts(job().FilesToDelete()), ElementsAre("\\f"));
}

TEST_F(FieldsTest, NeedTheExactGroupNameForActionAndName) {
  Begin("DiskCleanup");
  Begin("FILE");
  EXPECT_EQ(Set("Action", "Save"), ICFG_OK);
  EXPECT_EQ(Set("Name", "\\f"), ICFG_OK);
  End("FILE");
  EXPECT_THAT(Texts(job().FilesToSave()), IsEmpty());

  Begin("STORE");
  Set("Name", "\\store");
  End("Store");
  EXPECT_STREQ(job().StorageRequirements()[0]->name, "");
}

TEST_F(FieldsTest, CountTheLastBegunGroupAfterItsEndToo) {
  Begin("DiskCleanup");
  Begin("File");
  End("File");
  Set("Action", "Save");
  Set("Name", "\\late");
  End("File");

  EXPECT_THAT(Texts(job().FilesToSave()), ElementsAre("\\late"));
}

// ---- storage requirements and registry tests ----

TEST_F(FieldsTest, FillAStorageRequirement) {
  Begin("Store");
  Set("Name", "\\Flash File Store");
  Set("RequiredSpace", "12 MB");
  End("Store");

  ASSERT_EQ(job().StorageRequirements().size(), 1U);
  EXPECT_STREQ(job().StorageRequirements()[0]->name, "\\Flash File Store");
  EXPECT_STREQ(job().StorageRequirements()[0]->required_space, "12 MB") << "kept as text";
}

TEST_F(FieldsTest, FillARegistryTest) {
  Begin("Registry");
  Set("Key", "Software\\X");
  Set("ValueName", "n");
  Set("Value", "v");
  Set("Operator", "==");
  Set("ErrorMsg", "no");
  End("Registry");
  Begin("Registry");
  Set("Root", "HKEY_CURRENT_USER");
  Set("Type", "REG_SZ");
  End("Registry");

  ASSERT_EQ(job().RegistryTests().size(), 2U);
  const tagRegistryTest& first = *job().RegistryTests()[0];
  EXPECT_STREQ(first.root, "HKEY_LOCAL_MACHINE");
  EXPECT_STREQ(first.key, "Software\\X");
  EXPECT_STREQ(first.value_name, "n");
  EXPECT_STREQ(first.value, "v");
  EXPECT_STREQ(first.type, "String");
  EXPECT_STREQ(first.operation, "==");
  EXPECT_STREQ(first.error_message, "no");
  EXPECT_STREQ(job().RegistryTests()[1]->root, "HKEY_CURRENT_USER");
  EXPECT_STREQ(job().RegistryTests()[1]->type, "REG_SZ");
}

TEST_F(FieldsTest, AcceptRecordFieldsWithNothingCurrent) {
  for (const char* field : {"RequiredSpace", "Root", "Key", "ValueName", "Type", "Operator",
                            "Value", "ErrorMsg", "Source", "Dest", "CRC", "MCTMask"}) {
    EXPECT_EQ(Set(field, "x"), ICFG_OK) << field;
  }
}

TEST_F(FieldsTest, RefuseAnUnknownFieldAndChangeNothing) {
  EXPECT_EQ(Set("Val", "x"), ICFG_UNKNOWN_NAME);
  EXPECT_EQ(Set("Portal", "1"), ICFG_UNKNOWN_NAME);

  EXPECT_EQ(job().GetSysLogPort(), 0);
}

}  // namespace
}  // namespace configlet
