// Every text field of the schema at its limit, one character beyond it and far beyond.
#include <gtest/gtest.h>

#include <string>
#include <string_view>

#include "configlet/configlet_test.h"

namespace configlet {
namespace {

using Job = UpgradeConfig;

const tagDownloadFile& File(const Job& job) {
  return *job.DownloadFiles()[0];
}
const tagStorageReq& Store(const Job& job) {
  return *job.StorageRequirements()[0];
}
const tagRegistryTest& Test(const Job& job) {
  return *job.RegistryTests()[0];
}

struct LimitCase {
  const char* around;  ///< group around `group`, null for none
  const char* group;
  const char* field;
  std::size_t size;  ///< of the field, its terminating zero included
  std::string (*kept)(const Job& job);
};

constexpr LimitCase kLimits[] = {
    {nullptr, "Syslog", "Address", 32, [](const Job& j) -> std::string { return j.GetSysLogIP(); }},
    {nullptr, "Syslog", "IPAddress", 24,
     [](const Job& j) -> std::string { return j.GetHTTPIPAddress(); }},
    {nullptr, "Syslog", "BaseURL", 256, [](const Job& j) -> std::string { return j.GetBaseURL(); }},
    {nullptr, "Syslog", "MulticastIP", 24, [](const Job& j) -> std::string { return j.GetMCIp(); }},
    {nullptr, "Syslog", "EncryptionKey", 256,
     [](const Job& j) -> std::string { return j.GetMCEncryptionKey(); }},
    {nullptr, "Syslog", "BeginText", 64,
     [](const Job& j) -> std::string { return j.GetUpgBeginMsg(); }},
    {nullptr, "Syslog", "EndText", 64,
     [](const Job& j) -> std::string { return j.GetUpgEndMsg(); }},
    {nullptr, "MulticastClient", "Parameters", 260,
     [](const Job& j) -> std::string { return j.GetMCProcessParms(); }},
    {nullptr, "StartProcess", "Process", 260,
     [](const Job& j) -> std::string { return j.GetProcessName(); }},
    {nullptr, "StartProcess", "Parameters", 260,
     [](const Job& j) -> std::string { return j.GetProcessParms(); }},
    {"Download", "File", "Source", 260, [](const Job& j) -> std::string { return File(j).source; }},
    {"Download", "File", "Dest", 260,
     [](const Job& j) -> std::string { return File(j).destination; }},
    {"Download", "File", "CRC", 32, [](const Job& j) -> std::string { return File(j).crc; }},
    {"Download", "File", "MCTMask", 2008,
     [](const Job& j) -> std::string { return File(j).masks; }},
    {nullptr, "FileList", "Source", 260,
     [](const Job& j) -> std::string { return j.GetMCFileList()->source; }},
    {nullptr, "FileList", "Dest", 260,
     [](const Job& j) -> std::string { return j.GetMCFileList()->destination; }},
    {nullptr, "FileList", "CRC", 32,
     [](const Job& j) -> std::string { return j.GetMCFileList()->crc; }},
    {nullptr, "FileList", "MCTMask", 2008,
     [](const Job& j) -> std::string { return j.GetMCFileList()->masks; }},
    {nullptr, "Store", "Name", 260, [](const Job& j) -> std::string { return Store(j).name; }},
    {nullptr, "Store", "RequiredSpace", 32,
     [](const Job& j) -> std::string { return Store(j).required_space; }},
    {"Tests", "Registry", "Root", 260, [](const Job& j) -> std::string { return Test(j).root; }},
    {"Tests", "Registry", "Key", 260, [](const Job& j) -> std::string { return Test(j).key; }},
    {"Tests", "Registry", "ValueName", 260,
     [](const Job& j) -> std::string { return Test(j).value_name; }},
    {"Tests", "Registry", "Type", 24, [](const Job& j) -> std::string { return Test(j).type; }},
    {"Tests", "Registry", "Operator", 12,
     [](const Job& j) -> std::string { return Test(j).operation; }},
    {"Tests", "Registry", "Value", 260, [](const Job& j) -> std::string { return Test(j).value; }},
    {"Tests", "Registry", "ErrorMsg", 256,
     [](const Job& j) -> std::string { return Test(j).error_message; }},
};

/// A text whose every part can be told from every other.
std::string TextOf(std::size_t length) {
  std::string text;
  for (std::size_t i = 0; text.size() < length; ++i) text += std::to_string(i) + '/';
  text.resize(length);
  return text;
}

class FieldLimitsTest : public ConfigletTest {
 protected:
  static bool ShareAGroup(const LimitCase& a, const LimitCase& b) {
    return std::string_view(a.group) == b.group;
  }

  /// A new job in which the field has `value` and the others of its group have their own names.
  static void Fill(const LimitCase& c, const char* value) {
    Begin("Orvenix");
    if (c.around != nullptr) Begin(c.around);
    Begin(c.group);
    for (const LimitCase& other : kLimits) {
      if (ShareAGroup(c, other)) Set(other.field, other.field);
    }
    EXPECT_EQ(Set(c.field, value), ICFG_OK);
    End(c.group);
    if (c.around != nullptr) End(c.around);
  }
};

TEST_F(FieldLimitsTest, KeepWhatFitsCutWhatDoesNotAndTouchNoOther) {
  for (const LimitCase& c : kLimits) {
    for (const std::size_t length :
         {std::size_t{0}, c.size - 1, c.size, c.size + 1, c.size + 3000}) {
      const std::string value = TextOf(length);

      Fill(c, value.c_str());

      EXPECT_EQ(c.kept(job()), value.substr(0, c.size - 1))
          << c.group << '/' << c.field << ' ' << length;
      for (const LimitCase& other : kLimits) {
        if (&other == &c || !ShareAGroup(c, other)) continue;
        EXPECT_EQ(other.kept(job()), other.field) << c.group << '/' << c.field << ' ' << length;
      }
    }
  }
}

TEST_F(FieldLimitsTest, TakeANullValueForAnEmptyOne) {
  for (const LimitCase& c : kLimits) {
    Fill(c, nullptr);

    EXPECT_EQ(c.kept(job()), "") << c.group << '/' << c.field;
  }
}

TEST_F(FieldLimitsTest, KeepAllOfAProgramToStop) {
  Begin("Orvenix");
  Begin("StopProcess");
  Set("Process", TextOf(5000).c_str());

  ASSERT_EQ(job().ProcessesToStop().size(), 1U);
  EXPECT_EQ(job().ProcessesToStop()[0], TextOf(5000));
}

TEST_F(FieldLimitsTest, CutACleanupNameToItsBuffer) {
  Begin("Orvenix");
  Begin("DiskCleanup");
  for (const char* action : {"Save", "Delete"}) {
    for (const std::size_t length : {std::size_t{259}, std::size_t{260}, std::size_t{4000}}) {
      Begin("File");
      Set("Action", action);
      Set("Name", TextOf(length).c_str());
      End("File");
    }
  }

  const std::string cut = TextOf(259);
  for (const auto* list : {&job().FilesToSave(), &job().FilesToDelete()}) {
    ASSERT_EQ(list->size(), 3U);
    for (const char* name : *list) EXPECT_EQ(name, cut);
  }
}

}  // namespace
}  // namespace configlet
